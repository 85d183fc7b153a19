// The arguments file of the driver and the list file: the bounded line reader, and the product
// names the driver makes from what it read.
#include "fuzz_support.h"
#include "qorv_chain_driver.h"
#include "qorv_errors.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* theData, std::size_t theSize)
{
    qfuzz::setUpRun();
    const std::string aPath = qfuzz::writeInput("args.txt", theData, theSize);
    QFUZZ_CLEAN_FAILURES({
        std::vector<std::string> aArgs = fdfReadArgumentsFile(aPath);
        if (aArgs.size() >= static_cast<std::size_t>(CQORV_FOC_INPUT_PARAM_NBR)) {
            CChainRun aRun(aArgs, {aArgs[0]});
            aRun.checkProductNames();
        }
    });
    return 0;
}
