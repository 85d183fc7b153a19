// The JSON reader of the tools (scene and truth files) and its writer: a parsed value written
// out parses again to the same text.
#include <cstdio>
#include <cstdlib>
#include <stdexcept>
#include <string>

#include "qorv_json.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* theData, std::size_t theSize)
{
    const std::string aText(reinterpret_cast<const char*>(theData), theSize);
    CJson aValue;
    try {
        aValue = CJson::parse(aText);
    } catch (const std::runtime_error&) {
        return 0;  // a refused text is the intended end
    }
    const std::string aOut = aValue.dump(0);
    std::string aAgain;
    try {
        aAgain = CJson::parse(aOut).dump(0);
    } catch (const std::runtime_error& e) {
        std::fprintf(stderr, "written JSON does not parse: %s\n", e.what());
        std::abort();
    }
    if (aAgain != aOut) {
        std::fprintf(stderr, "JSON round trip differs\n");
        std::abort();
    }
    return 0;
}
