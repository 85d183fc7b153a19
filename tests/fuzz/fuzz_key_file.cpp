// Key files (field names and type tokens of a section) and mandatory files (the fields that must
// hold a value), both through the store's line reader.
#include <memory>

#include "fuzz_support.h"
#include "qorv_description_section.h"
#include "qorv_errors.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* theData, std::size_t theSize)
{
    qfuzz::setUpRun();
    static std::unique_ptr<CDescriptionHeader> aHeader = std::make_unique<CDescriptionHeader>(
        std::initializer_list<const char*>{"StoreTest", "RasterInfo", "Sensor"});
    const std::string aPath = qfuzz::writeInput("in.key", theData, theSize);
    // Any section name: the first section header of the file names it.
    QFUZZ_CLEAN_FAILURES({
        CDescriptionSection aSection("", aPath.c_str());
        aSection.print(true);
    });
    QFUZZ_CLEAN_FAILURES(aHeader->checkMandatory(aPath.c_str(), true));
    return 0;
}
