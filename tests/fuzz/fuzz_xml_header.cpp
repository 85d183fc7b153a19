// The XML header reader (pre-pass, expat, counts, values) and the writer behind it: whatever the
// reader accepts, the writer either refuses or writes a file that reads back.
#include <cstdlib>
#include <memory>

#include "fuzz_support.h"
#include "qorv_description_section.h"
#include "qorv_errors.h"

namespace {

std::unique_ptr<CDescriptionHeader> makeHeader()
{
    return std::make_unique<CDescriptionHeader>(
        std::initializer_list<const char*>{"StoreTest", "StoreSecond", "RasterInfo", "ChannelInfo", "Sensor"});
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* theData, std::size_t theSize)
{
    qfuzz::setUpRun();
    static std::unique_ptr<CDescriptionHeader> aHeader = makeHeader();
    static std::unique_ptr<CDescriptionHeader> aCheck = makeHeader();
    const std::string aInput = qfuzz::writeInput("in.sml", theData, theSize);
    bool aRead = false;
    QFUZZ_CLEAN_FAILURES(aRead = aHeader->readXML(aInput.c_str(), false));
    if (!aRead) return 0;
    const std::string aOutput = qfuzz::scratchDir() + "out.sml";
    std::remove(aOutput.c_str());
    bool aWritten = false;
    QFUZZ_CLEAN_FAILURES(aWritten = aHeader->writeXML(aOutput.c_str(), true, false));
    if (!aWritten) return 0;
    // What the writer put in place must read back.
    bool aBack = false;
    try {
        aBack = aCheck->readXML(aOutput.c_str(), false);
    } catch (const CErrorExceptionManager& e) {
        std::fprintf(stderr, "written header fails to read back: id %d\n", e.mId);
        std::abort();
    }
    if (!aBack) {
        std::fprintf(stderr, "written header does not parse\n");
        std::abort();
    }
    return 0;
}
