#include "qorv_progress.h"

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <thread>

#include <unistd.h>

#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"

namespace {

constexpr int CQORV_PROGRESS_TRIES = 10;
constexpr int CQORV_PROGRESS_GIVE_UP = 4;
int gRetrySleepMs = 1000;

void retrySleep() { std::this_thread::sleep_for(std::chrono::milliseconds(gRetrySleepMs)); }

std::string readLine(FILE* theFile)
{
    std::string aLine;
    int c;
    while ((c = std::fgetc(theFile)) != EOF && c != '\n')
        if (aLine.size() < CQORV_CATALOG_TEXT_LEN) aLine += static_cast<char>(c);
    return aLine;
}

/// The stream's state in words, as the trace shows it after a failed open.
const char* streamStateWords(FILE* theFile)
{
    if (!theFile) return "| A severe I/O error or unknown state";
    if (std::feof(theFile)) return "End of file reached ";
    if (std::ferror(theFile)) return "| A possibly recoverable formatting or conversion error ";
    return "";
}

/// Waits for the working file: up to ten tests, one second apart.
bool waitForWorkingFile()
{
    for (int aTry = 0; aTry < CQORV_PROGRESS_TRIES; ++aTry) {
        if (fqorvFileExists(gWorkingFile)) return true;
        fdfTrace("[%d] getAndSetPerc - Not found the file : %s\n", aTry, gWorkingFile.c_str());
        if (aTry + 1 < CQORV_PROGRESS_TRIES) retrySleep();
    }
    return false;
}

void writeProgress(FILE* theFile, int thePercent, const std::string& theTitle)
{
    const std::string aText = std::to_string(thePercent) + "\n" + theTitle + "\n";
    std::fputs(aText.c_str(), theFile);
    std::fflush(theFile);
    // The old title may have been longer: nothing of it must stay behind the new lines.
    if (ftruncate(fileno(theFile), static_cast<off_t>(aText.size())) != 0) { /* the lines stand */ }
}

/// A working file that cannot be written still carries the operator's stop: read it, publish nothing.
bool readStopOnly()
{
    FILE* aFile = std::fopen(gWorkingFile.c_str(), "r");
    if (!aFile) return true;
    const std::string aFirst = readLine(aFile);
    std::fclose(aFile);
    int aValue = 0;
    if (std::sscanf(aFirst.c_str(), "%i", &aValue) == 1 && aValue > 100) QORV_FATAL(CQORV_ERR_OPERATOR_STOP, nullptr);
    return true;
}

}  // namespace

bool fdfOpenFailureMayPass(int theErrno)
{
    return theErrno == EBUSY || theErrno == ETXTBSY || theErrno == EAGAIN || theErrno == EINTR || theErrno == EMFILE ||
           theErrno == ENFILE || theErrno == ENOMEM || theErrno == 0;
}

void fdfSetProgressRetrySleepMs(int theMilliseconds) { gRetrySleepMs = theMilliseconds < 0 ? 0 : theMilliseconds; }
int fdfProgressRetrySleepMs() { return gRetrySleepMs; }

bool getAndSetPerc(int theOldPercent, int theNewPercent, const char* theTitle)
{
    if (theOldPercent == theNewPercent || theNewPercent >= 100) return true;
    std::remove((gWorkingFile + "_batch_ok").c_str());

    if (!waitForWorkingFile()) {
        // The calling program deleted the file: make it anew.
        fdfTrace("getAndSetPerc - Not found the file : %s\n", gWorkingFile.c_str());
        FILE* aFile = nullptr;
        for (int aTry = 0; aTry < CQORV_PROGRESS_TRIES && !aFile; ++aTry) {
            errno = 0;
            aFile = std::fopen(gWorkingFile.c_str(), "w");
            if (!aFile) {
                const int aErrno = errno;
                fdfTrace("%d File %s attempt create : \n", aTry, gWorkingFile.c_str());
                if (!fdfOpenFailureMayPass(aErrno)) break;
                retrySleep();
            }
        }
        if (!aFile) {
            fdfTrace(" File ERROR %s not found\n", gWorkingFile.c_str());
            QORV_FATAL(CQORV_ERR_OPERATOR_STOP, nullptr);
        }
        writeProgress(aFile, theNewPercent, theTitle ? theTitle : "");
        std::fclose(aFile);
        return true;
    }

    FILE* aFile = nullptr;
    for (int aTry = 0; aTry < CQORV_PROGRESS_TRIES && !aFile; ++aTry) {
        errno = 0;
        aFile = std::fopen(gWorkingFile.c_str(), "r+");
        if (aFile) break;
        const int aErrno = errno;
        fdfTrace("%d File %s attempt open :  RDSTATE = %s\n", aTry, gWorkingFile.c_str(), streamStateWords(aFile));
        if (!fdfOpenFailureMayPass(aErrno)) return readStopOnly();  // cannot be written at all: no waiting
        if (aTry + 1 >= CQORV_PROGRESS_GIVE_UP) return true;  // held by the calling program: give up quietly
        retrySleep();
    }
    const std::string aFirst = readLine(aFile);
    const std::string aOldTitle = readLine(aFile);
    int aValue = 0;
    const bool aHasValue = std::sscanf(aFirst.c_str(), "%i", &aValue) == 1;
    std::rewind(aFile);
    if (aHasValue && aValue > 100) {
        // The operator's stop.
        std::fclose(aFile);
        QORV_FATAL(CQORV_ERR_OPERATOR_STOP, nullptr);
    }
    writeProgress(aFile, theNewPercent, theTitle ? std::string(theTitle) : aOldTitle);
    std::fclose(aFile);
    return true;
}

void fdfProgress(int& theLastPercent, long long theDone, long long theTotal)
{
    if (theTotal <= 0) return;
    const int aPercent = static_cast<int>(theDone * 100 / theTotal);
    if (aPercent == theLastPercent || aPercent >= 100) return;
    if (!getAndSetPerc(theLastPercent, aPercent, nullptr)) {
        fdfTrace("\n EXECUTION INTERRUPTED BY OPERATOR\n");
        QORV_FATAL(CQORV_ERR_OPERATOR_STOP, nullptr);
    }
    theLastPercent = aPercent;
}
