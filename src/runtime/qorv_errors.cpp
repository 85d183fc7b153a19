#include "qorv_errors.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iostream>
#include <string>
#include <thread>
#include <vector>

#include "qorv_enviroment.h"
#include "qorv_generic_utility.h"
#include "qorv_progress.h"

CErrorCatalog gErrorCatalog;
CErrorCatalog gWarningCatalog;
bool gReportingMode = false;
int gWarningsCounter = 0;

namespace {

constexpr const char* CQORV_INIT_ERROR_TEXT = "AN ERROR OCCUR DURING Qorvex INIT";
constexpr const char* CQORV_WRONG_CODE_TEXT = "GENERIC ERROR WRONG CODE";
constexpr int CQORV_MAX_TOTAL_IN_ERROR = CQORV_MAX_LINE_IN_ERROR * CQORV_MAX_LEN_IN_ERROR;  // 144
constexpr int CQORV_RESULT_FILE_TRIES = 10;

QorvExitHandler gExitHandler = nullptr;

void copyText(char* theTarget, const std::string& theText, std::size_t theSize)
{
    std::snprintf(theTarget, theSize, "%s", theText.c_str());
}

/// First token of a key line: separated by blank, line feed, tab or comma.
std::string firstToken(const std::string& theLine)
{
    const std::size_t aBegin = theLine.find_first_not_of(" \n\t,");
    if (aBegin == std::string::npos) return std::string();
    const std::size_t aEnd = theLine.find_first_of(" \n\t,", aBegin);
    return theLine.substr(aBegin, aEnd == std::string::npos ? std::string::npos : aEnd - aBegin);
}

/// Index of the line "[<wanted>...]" at or after theFrom, comparing over the wanted name's length.
long findBlock(const std::vector<std::string>& theLines, std::size_t theFrom, const std::string& theWanted)
{
    for (std::size_t i = theFrom; i < theLines.size(); ++i) {
        const std::string& aLine = theLines[i];
        if (aLine.size() < 2 || aLine[0] != '[') continue;
        const std::size_t aClose = aLine.find(']');
        const std::string aInside = aLine.substr(1, aClose == std::string::npos ? std::string::npos : aClose - 1);
        if (aInside.compare(0, theWanted.size(), theWanted) == 0 && aInside.size() >= theWanted.size())
            return static_cast<long>(i);
    }
    return -1;
}

/// The parameter lines of the result files: at most three lines of 48 characters, 144 in all.
std::string parameterLines(int theId, const std::vector<const char*>& theParameters)
{
    std::string aOut;
    int aLine = 0;
    int aTotLen = 0;
    for (const char* aParameter : theParameters) {
        if (aLine >= CQORV_MAX_LINE_IN_ERROR) break;
        std::string aText = aParameter ? aParameter : "";
        // The user sees the name of the header that exists: "_hdr" stands for ".sml".
        if (theId >= CQORV_ERR_WORKING_FILE_REMOVE && theId <= CQORV_ERR_NO_NON_NULL_POINTS &&
            aText.size() >= 4 && aText.compare(aText.size() - 4, 4, "_hdr") == 0)
            aText = aText.substr(0, aText.size() - 4) + ".sml";
        const int aLen = static_cast<int>(aText.size());
        if (aLen < CQORV_MAX_LEN_IN_ERROR + 1) {
            ++aLine;
            if (aTotLen + aLen < CQORV_MAX_TOTAL_IN_ERROR) aOut += aText + "\n";
        } else {
            ++aLine;
            std::string aBroken;
            for (int aPos = 0; aPos < aLen && aTotLen + aPos < CQORV_MAX_TOTAL_IN_ERROR; ++aPos) {
                if (aPos > 0 && aPos % CQORV_MAX_LEN_IN_ERROR == 0 && aLen - aPos >= 6) {
                    aBroken += '\n';
                    ++aLine;
                }
                aBroken += aText[static_cast<std::size_t>(aPos)];
            }
            aOut += aBroken + "\n";
        }
        aTotLen += aLen;
    }
    return aOut;
}

/// Block B of the result files, without its first line "-1".
std::string resultBlock(int theId, const std::vector<const char*>& theParameters)
{
    char aPrimary[CQORV_CATALOG_TEXT_LEN + 64];
    char aSecondary[CQORV_CATALOG_TEXT_LEN + 64];
    gErrorCatalog.getPrimaryText(theId, aPrimary);
    gErrorCatalog.getSecondaryText(theId, aSecondary);
    std::string aBlock = std::string(aPrimary) + "\n";
    aBlock += fqorvStringFormat("%s [EC : %d]\n", aSecondary, theId);
    aBlock += parameterLines(theId, theParameters);
    aBlock += "\n" + std::string(66, ' ') + "\n" + std::string(66, ' ') + "\n";
    return aBlock;
}

bool writeWholeFile(const std::string& thePath, const std::string& theText)
{
    return fqorvWriteTextAtomically(thePath, theText);
}

/// Reads a line of at most theMax characters, without its line feed.
std::string readLine(FILE* theFile, std::size_t theMax)
{
    std::string aLine;
    int c;
    while ((c = std::fgetc(theFile)) != EOF && c != '\n')
        if (aLine.size() < theMax) aLine += static_cast<char>(c);
    return aLine;
}

/// Rewrites the working file: -1 (or -2), the kept title line, then the block.
bool rewriteWorkingFile(int theId, const std::string& theBlock)
{
    FILE* aFile = nullptr;
    for (int aTry = 0; aTry < CQORV_RESULT_FILE_TRIES && !aFile; ++aTry) {
        errno = 0;
        aFile = std::fopen(gWorkingFile.c_str(), "r+");
        if (aFile) break;
        if (!fdfOpenFailureMayPass(errno)) break;  // cannot be written at all: no waiting
        std::this_thread::sleep_for(std::chrono::milliseconds(fdfProgressRetrySleepMs()));
    }
    if (!aFile) return false;
    readLine(aFile, CQORV_CATALOG_TEXT_LEN);
    const std::string aTitle = readLine(aFile, CQORV_CATALOG_TEXT_LEN);
    std::rewind(aFile);
    const std::string aText = std::string(theId == CQORV_WARNINGS_PSEUDO_ID ? "-2" : "-1") + "\n" + aTitle + "\n" + theBlock;
    std::fputs(aText.c_str(), aFile);
    std::fflush(aFile);
    // The old content may have been longer: nothing of it must stand behind the new text.
    if (ftruncate(fileno(aFile), static_cast<off_t>(aText.size())) != 0) { /* the text stands; ignore */ }
    std::fclose(aFile);
    return true;
}

/// The failure's texts on the standard error stream, whatever became of the result files.
void reportOnStandardError(int theId, const std::vector<const char*>& theParameters)
{
    char aPrimary[CQORV_CATALOG_TEXT_LEN + 64];
    char aSecondary[CQORV_CATALOG_TEXT_LEN + 64];
    gErrorCatalog.getPrimaryText(theId, aPrimary);
    gErrorCatalog.getSecondaryText(theId, aSecondary);
    std::cerr << aPrimary << "\n" << aSecondary << "\n";
    for (const char* p : theParameters) std::cerr << (p ? p : "") << "\n";
    std::cerr.flush();
}

}  // namespace

// ------------------------------------------------------------------------------------------------
// Catalogues

void CErrorCatalog::reset()
{
    mWarningNbr = 0;
    mPECNbr = 0;
    mPECTexts.clear();
    mSECNbr.clear();
    mSECTexts.clear();
}

bool CErrorCatalog::read(const char* thePath)
{
    reset();
    std::vector<std::string> aLines;
    if (!fqorvReadTextLines(thePath, aLines) || aLines.empty()) return false;
    const int aN = std::atoi(aLines[0].c_str());
    if (aN <= 0 || static_cast<std::size_t>(2 * aN + 3) > aLines.size()) return false;
    std::vector<std::string> aKeys;
    for (int i = 0; i < aN; ++i) aKeys.push_back(firstToken(aLines[static_cast<std::size_t>(2 + i)]));
    for (int i = 0; i < aN; ++i) mPECTexts.push_back(aLines[static_cast<std::size_t>(aN + 3 + i)]);
    const std::size_t aBlocksStart = static_cast<std::size_t>(2 * aN + 3);
    mSECNbr.assign(static_cast<std::size_t>(aN), 0);
    mSECTexts.assign(static_cast<std::size_t>(aN), {});
    for (int i = 0; i < aN; ++i) {
        const long aBlock = findBlock(aLines, aBlocksStart, "ErrorCodeInfo_" + aKeys[static_cast<std::size_t>(i)]);
        if (aBlock < 0 || static_cast<std::size_t>(aBlock + 1) >= aLines.size()) continue;
        int aCount = std::atoi(aLines[static_cast<std::size_t>(aBlock + 1)].c_str());
        auto& aTexts = mSECTexts[static_cast<std::size_t>(i)];
        for (int k = 0; k < aCount && static_cast<std::size_t>(aBlock + 2 + k) < aLines.size(); ++k) {
            std::string aText = aLines[static_cast<std::size_t>(aBlock + 2 + k)];
            if (aText.size() > CQORV_CATALOG_TEXT_LEN - 1) aText.resize(CQORV_CATALOG_TEXT_LEN - 1);
            aTexts.push_back(aText);
        }
        mSECNbr[static_cast<std::size_t>(i)] = static_cast<int>(aTexts.size());
    }
    mPECNbr = aN;
    return true;
}

void CErrorCatalog::getErrorText(int theId, char* thePrimary, char* theSecondary) const
{
    const int aPEC = fqorvPEC(theId), aSEC = fqorvSEC(theId);
    if (isEmpty()) {
        copyText(thePrimary, CQORV_INIT_ERROR_TEXT, CQORV_CATALOG_TEXT_LEN);
        theSecondary[0] = '\0';
        return;
    }
    const bool aPECKnown = aPEC >= 0 && aPEC < mPECNbr;
    copyText(thePrimary, aPECKnown ? mPECTexts[static_cast<std::size_t>(aPEC)] : CQORV_WRONG_CODE_TEXT, CQORV_CATALOG_TEXT_LEN);
    if (aPECKnown && aSEC >= 0 && aSEC < mSECNbr[static_cast<std::size_t>(aPEC)]) {
        copyText(theSecondary, mSECTexts[static_cast<std::size_t>(aPEC)][static_cast<std::size_t>(aSEC)], CQORV_CATALOG_TEXT_LEN);
        return;
    }
    fdfTrace("  EC = %d  PEC = %d  SEC = %d\n", theId, aPEC, aSEC);
    copyText(theSecondary, aSEC < 0 ? "" : CQORV_WRONG_CODE_TEXT, CQORV_CATALOG_TEXT_LEN);
}

void CErrorCatalog::getPrimaryText(int theId, char* theBuffer) const
{
    const int aPEC = fqorvPEC(theId);
    if (isEmpty()) {
        std::sprintf(theBuffer, "%s  : [%d]", CQORV_INIT_ERROR_TEXT, theId);
    } else if (aPEC < 0 || aPEC >= mPECNbr) {
        std::sprintf(theBuffer, "%s  :  %d [PEC %d]", CQORV_WRONG_CODE_TEXT, theId, aPEC);
    } else {
        copyText(theBuffer, mPECTexts[static_cast<std::size_t>(aPEC)], CQORV_CATALOG_TEXT_LEN);
    }
}

void CErrorCatalog::getSecondaryText(int theId, char* theBuffer) const
{
    const int aPEC = fqorvPEC(theId), aSEC = fqorvSEC(theId);
    if (isEmpty()) {
        std::sprintf(theBuffer, "%s  : [%d]", CQORV_INIT_ERROR_TEXT, theId);
        return;
    }
    const bool aPECKnown = aPEC >= 0 && aPEC < mPECNbr;
    if (aPECKnown && aSEC == -1) {
        theBuffer[0] = '\0';  // an id that is a multiple of 65280 has its primary text alone
    } else if (aPECKnown && aSEC >= 0 && aSEC < mSECNbr[static_cast<std::size_t>(aPEC)]) {
        copyText(theBuffer, mSECTexts[static_cast<std::size_t>(aPEC)][static_cast<std::size_t>(aSEC)], CQORV_CATALOG_TEXT_LEN);
    } else {
        fdfTrace("******** aActPEC = %d\n******** mPECNbr = %d\n******** aActSEC = %d\n******** mSECNbr[aActPEC] = %d\n",
                 aPEC, mPECNbr, aSEC, aPECKnown ? mSECNbr[static_cast<std::size_t>(aPEC)] : -1);
        std::sprintf(theBuffer, "%s  :  %d [%d : %d]", CQORV_WRONG_CODE_TEXT, theId, aPEC, aSEC);
    }
}

CErrorExceptionManager::CErrorExceptionManager(int theId, int theLine, const char* theFile, const char* theTitle,
                                               const char* theParameter)
    : mLine(theLine), mId(theId), mPEC(fqorvPEC(theId)), mSEC(fqorvSEC(theId))
{
    std::snprintf(mTitle, sizeof mTitle, "%s", theTitle ? theTitle : "");
    std::snprintf(mFile, sizeof mFile, "%s", theFile ? theFile : "");
    std::snprintf(mParameter, sizeof mParameter, "%s", theParameter ? theParameter : "");
    gErrorCatalog.getErrorText(theId, mPrimaryText, mSecondaryText);
}

// ------------------------------------------------------------------------------------------------
// Result files and the failure road

bool writeResultFiles(int theId, const char* theParameter, ...)
{
    std::vector<const char*> aParameters;
    va_list aArgs;
    va_start(aArgs, theParameter);
    for (const char* p = theParameter; p; p = va_arg(aArgs, const char*)) aParameters.push_back(p);
    va_end(aArgs);

    if (QorvFailureCallback aCallback = fdfGetFailureCallback()) aCallback(theId);
    if (gWorkingFile.empty()) return false;  // the working file is not known yet

    const std::string aBlock = resultBlock(theId, aParameters);
    writeWholeFile(gWorkingFile + "_error", "-1\n" + aBlock);
    const bool aOk = rewriteWorkingFile(theId, aBlock) || writeWholeFile(gWorkingFile + "_tmp", aBlock);
    reportOnStandardError(theId, aParameters);
    return aOk;
}

void fqorvFatal(int theId, const char* theParameter, const char* theFile, int theLine)
{
    const int aErrno = errno;
    if (!gReportingMode) throw CErrorExceptionManager(theId, theLine, theFile, fdfGetTitle(), theParameter);
    char aPrimary[CQORV_CATALOG_TEXT_LEN];
    char aSecondary[CQORV_CATALOG_TEXT_LEN];
    gErrorCatalog.getErrorText(theId, aPrimary, aSecondary);
    if (!fdfSettingsExist()) fqorvExitProcess(theId);
    const char* aParameter = theParameter ? theParameter : "";
    writeResultFiles(theId, aParameter, static_cast<const char*>(nullptr));
    fdfTrace("\nERROR : %s [%s] (%s) \n %s   %s\n    FILE=%s   LINE=%d  (errno = %d)", aPrimary, aSecondary,
             aParameter, fdfGetTitle(), gVersionText.c_str(), theFile, theLine, aErrno);
    fdfLog("\n\n%s [ERROR ID : %d]\n  %s [%s]\n  %s \n\n", gVersionText.c_str(), theId, aPrimary, aSecondary, aParameter);
    fdfCloseAll(theId, true, true);
    fdfFreeSettings();
    fqorvExitProcess(theId);
}

void fqorvWarning(int theId, const char* theParameter, const char* theFile, int theLine)
{
    const int aErrno = errno;
    char aPrimary[CQORV_CATALOG_TEXT_LEN];
    char aSecondary[CQORV_CATALOG_TEXT_LEN];
    gWarningCatalog.getErrorText(theId, aPrimary, aSecondary);
    const char* aParameter = theParameter ? theParameter : "";
    fdfTrace("\nWARNING : %s [%s] (%s) \n %s   %s\n    FILE=%s   LINE=%d  (errno = %d)", aPrimary, aSecondary,
             aParameter, fdfGetTitle(), gVersionText.c_str(), theFile, theLine, aErrno);
    fdfLog("\n\nWARNING : [ERROR ID : %d] %s [%s]\n  %s \n\n", theId, aPrimary, aSecondary, aParameter);
}

void fqorvSuccess(const char* theFile, int theLine)
{
    char aPrimary[CQORV_CATALOG_TEXT_LEN];
    char aSecondary[CQORV_CATALOG_TEXT_LEN];
    gErrorCatalog.getErrorText(0, aPrimary, aSecondary);
    if (!fdfSettingsExist()) fqorvExitProcess(0);
    std::remove(gWorkingFile.c_str());
    fdfTrace("\nERROR : %s [%s] (%s) \n %s   %s\n    FILE=%s   LINE=%d  (errno = %d)", aPrimary, aSecondary, "",
             fdfGetTitle(), gVersionText.c_str(), theFile, theLine, errno);
    fdfTrace("\n\nSUCCESSFULL\n\n\n");
    fdfLog("\n\nSUCCESSFULL\n\n\n");
    fdfCloseAll(0, true, true);
    fdfFreeSettings();
    fqorvExitProcess(0);
}

// ------------------------------------------------------------------------------------------------
// The end of the process

int fqorvExitStatus(int theId)
{
    if (theId == 0) return 0;
    const int aPEC = theId > 0 ? fqorvPEC(theId) : 0;
    return (aPEC >= 1 && aPEC <= 254) ? aPEC : 255;
}

QorvExitHandler fdfSetExitHandler(QorvExitHandler theHandler)
{
    QorvExitHandler aOld = gExitHandler;
    gExitHandler = theHandler;
    return aOld;
}

void fqorvExitProcess(int theId)
{
    // The calling program reads the whole id here: the exit status keeps only 8 bits.
    const std::string aLine = fqorvStringFormat("QORVEX EXIT ID: %d\n", theId);
    if (::write(STDERR_FILENO, aLine.data(), aLine.size()) < 0) { /* nothing more can be done */ }
    if (gExitHandler) gExitHandler(theId);
    std::exit(fqorvExitStatus(theId));
}
