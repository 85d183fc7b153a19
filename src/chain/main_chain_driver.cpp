// The focuser's program: `qorvex <arguments file>`.
//
// The exit status is 0 on success; after a failure it is the failure's primary code (see
// docs/exit-status.md), and the whole failure id stands in the result files and as the last line
// "QORVEX EXIT ID: <id>" on standard error.
#include <string>

#include "qorv_chain_driver.h"
#include "qorv_envi_util.h"
#include "qorv_errors.h"

int main(int argc, char** argv)
{
    // The command line is one text, the path of the arguments file; blanks in it are kept.
    std::string aCommandLine;
    for (int i = 1; i < argc; ++i) aCommandLine += (i > 1 ? " " : "") + std::string(argv[i]);
    fqorvRegisterEnviHeaderWriter();
    const int aStatus = main_chain_driver(aCommandLine);
    fqorvExitProcess(aStatus);
}
