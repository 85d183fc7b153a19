// The text header reader of old files ("Name = value" lines, quoted strings, braced vectors and
// matrices) and the text writer behind it.
#include <memory>

#include "fuzz_support.h"
#include "qorv_description_section.h"
#include "qorv_errors.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* theData, std::size_t theSize)
{
    qfuzz::setUpRun();
    static std::unique_ptr<CDescriptionHeader> aHeader = std::make_unique<CDescriptionHeader>(
        std::initializer_list<const char*>{"StoreTest", "StoreSecond", "ChannelInfo"});
    const std::string aInput = qfuzz::writeInput("in_hdr", theData, theSize);
    bool aRead = false;
    QFUZZ_CLEAN_FAILURES(aRead = aHeader->readText(aInput.c_str(), false));
    if (!aRead) return 0;
    const std::string aOutput = qfuzz::scratchDir() + "out_hdr";
    std::remove(aOutput.c_str());
    QFUZZ_CLEAN_FAILURES(aHeader->writeText(aOutput.c_str(), false));
    return 0;
}
