#include "qorv_enviroment.h"

#include <spawn.h>
#include <sys/stat.h>
#include <sys/time.h>
#include <unistd.h>

#include <chrono>
#include <cmath>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <iostream>
#include <memory>
#include <new>
#include <thread>
#include <utility>
#include <vector>

#include "qorv_errors.h"
#include "qorv_generic_utility.h"
#include "qorv_line_pool.h"

extern char** environ;

bool gTraceActive = false;
std::ofstream gTrace;
std::ofstream gLog;
int gTraceLevel = 0;
std::string gWorkingFile;
std::string gVersionText;
float gDummyFloat = -9999.0f;
double gDummyDouble = -9999.0;

const char* const CQORV_DAY_NAMES[7] = {"Sunday", "Monay", "Tuesday", "Wensday", "thursday", "Friday", "Saturday"};
const char* const CQORV_MONTH_NAMES[12] = {"JAN", "FEB", "MAR", "APR", "MAY", "JUN",
                                           "JUL", "AUG", "SEP", "OCT", "NOV", "DEC"};

namespace {

/// Keys of the configuration lines; line 13 is read and not used.
constexpr const char* CQORV_CONFIG_KEYS[CQORV_CONFIG_LINES] = {
    CQORV_KEY_FILES_DIR, CQORV_MANDATORY_DIR, CQORV_WORKING_DIR, CQORV_EXE_DIR, CQORV_MAP_FILES_DIR,
    CQORV_CEOS_DES_FILES_DIR, CQORV_GCP_DATABASE_DIR, CQORV_ZENTA_DES_FILES_DIR, CQORV_OTHER_01_DES_FILES_DIR,
    CQORV_XML_SCHEMA_DES_FILES_DIR, CQORV_DEFAULT_BYTE_ORDER, CQORV_TRACING, nullptr, CQORV_DUMMY_VALUE};
constexpr int CQORV_CONFIG_DIRECTORY_LINES = 10;  // lines 1 to 10 name directories

struct CSetting {
    std::string mKey;
    std::string mValue;
};
struct CDeleteEntry {
    std::string mName;
    bool mFlag;
};

std::unique_ptr<std::vector<CSetting>> gSettings;
std::vector<CDeleteEntry> gDeleteList;
std::string gTitle;
QorvFailureCallback gFailureCallback = nullptr;
std::chrono::steady_clock::time_point gStartTime = std::chrono::steady_clock::now();

// Redirected standard streams and their saved buffers.
std::ofstream gCerrFile, gCoutFile, gClogFile;
std::streambuf* gSavedCerr = nullptr;
std::streambuf* gSavedCout = nullptr;
std::streambuf* gSavedClog = nullptr;

const std::string CQORV_RULE(160, '*');

std::string envValue(const char* theName)
{
    const char* aValue = std::getenv(theName);
    return aValue ? std::string(aValue) : std::string();
}

void writeBoth(const std::string& theText)
{
    fdfLog("%s", theText.c_str());
    fdfTrace("%s", theText.c_str());
}

/// Takes the line feed, a stray carriage return and the configured "backslash before the last
/// character" from a configuration line.
std::string cleanConfigLine(std::string theLine)
{
    if (!theLine.empty() && theLine.back() == '\n') theLine.pop_back();
    const std::size_t n = theLine.size();
    if (n >= 2 && theLine[n - 1] != '\\' && theLine[n - 2] == '\\') {
        theLine.resize(n - 2);
    } else if (!theLine.empty() && theLine.back() == '\r') {
        theLine.pop_back();
    }
    return theLine;
}

void onMemoryFailure()
{
    std::set_new_handler(nullptr);
    fdfTrace("Memory Not Found size\n");
    QORV_FATAL(CQORV_ERR_MEMORY, "Memory Not Found size");
}

void spawnDeferredDeletes(int /*theId*/)
{
    for (const CDeleteEntry& aEntry : gDeleteList)
        if (aEntry.mFlag) fdfSpawnDeleteFile(aEntry.mName.c_str());
}

}  // namespace

void fdfRestoreStandardStreams()
{
    if (gSavedCerr) std::cerr.rdbuf(gSavedCerr);
    if (gSavedCout) std::cout.rdbuf(gSavedCout);
    if (gSavedClog) std::clog.rdbuf(gSavedClog);
    gSavedCerr = gSavedCout = gSavedClog = nullptr;
}

namespace {

bool copyFile(const std::string& theFrom, const std::string& theTo)
{
    std::error_code aError;
    std::filesystem::copy_file(theFrom, theTo, std::filesystem::copy_options::overwrite_existing, aError);
    return !aError;
}

/// Reads the 14 lines of the configuration into the settings table.
void readConfiguration(const std::string& thePath, const std::string& theEnvWorkingDir)
{
    FILE* aFile = std::fopen(thePath.c_str(), "r");
    if (!aFile) QORV_FATAL(CQORV_ERR_MISSING_FILE, thePath.c_str());
    char aBuffer[512];
    for (int aLine = 0; aLine < CQORV_CONFIG_LINES; ++aLine) {
        if (!std::fgets(aBuffer, sizeof aBuffer, aFile)) {
            std::fclose(aFile);
            QORV_FATAL(CQORV_ERR_SETTING_MISSING, nullptr);
        }
        // A line over 511 characters would be read as two and shift every later setting.
        const std::size_t aLen = std::strlen(aBuffer);
        if (aLen == sizeof aBuffer - 1 && aBuffer[aLen - 1] != '\n') {
            std::fclose(aFile);
            fdfTrace("Configuration line %d of %s is over 511 characters\n", aLine + 1, thePath.c_str());
            QORV_FATAL(CQORV_ERR_SETTING_MISSING, thePath.c_str());
        }
        const char* aKey = CQORV_CONFIG_KEYS[aLine];
        if (!aKey) continue;
        std::string aValue = cleanConfigLine(aBuffer);
        if (aLine < CQORV_CONFIG_DIRECTORY_LINES) aValue = fdfNormaliseDirectory(aValue);
        if (aLine == 2 && !theEnvWorkingDir.empty()) aValue = theEnvWorkingDir;
        fdfSetEnvVar(aValue.c_str(), aKey);
    }
    std::fclose(aFile);
}

void setDummyValue()
{
    const std::string aDummy = fdfGetSetting(CQORV_DUMMY_VALUE);
    if (aDummy.compare(0, 3, "NaN") == 0) {
        gDummyFloat = std::nanf("");
        gDummyDouble = std::nan("");
    } else {
        gDummyDouble = std::strtod(aDummy.c_str(), nullptr);
        gDummyFloat = static_cast<float>(gDummyDouble);
    }
}

/// Opens the trace when QORVEX_TRACING says "ACTIVE" (over its six letters).
bool openTrace(bool theNewTrace)
{
    if (fdfGetSetting(CQORV_TRACING).compare(0, 6, "ACTIVE") != 0) return true;
    const std::string aPath = fdfWorkingPath("Process.trace");
    gTraceActive = true;
    gTraceLevel = 10;
    const auto aMode = std::ios::out | (theNewTrace ? std::ios::trunc : std::ios::app);
    gTrace.open(aPath, aMode);
    gTrace.close();
    gTrace.open(aPath, std::ios::out | std::ios::app);
    gTrace << "OpenTrace 1  2" << '\n';
    gTrace.flush();
    fdfRestoreStandardStreams();
    gCerrFile.close();
    gCoutFile.close();
    gClogFile.close();
    gCerrFile.open(aPath + "_cerr.txt");
    gCoutFile.open(aPath + "_cout.txt");
    gClogFile.open(aPath + "_clog.txt");
    gSavedCerr = std::cerr.rdbuf(gCerrFile.rdbuf());
    gSavedCout = std::cout.rdbuf(gCoutFile.rdbuf());
    gSavedClog = std::clog.rdbuf(gClogFile.rdbuf());
    static bool aRegistered = false;
    if (!aRegistered) {
        std::atexit(fdfRestoreStandardStreams);
        aRegistered = true;
    }
    return true;
}

void openLog()
{
    const std::string aPath = fdfWorkingPath("Process.log");
    gLog.open(aPath, std::ios::out | std::ios::app);
    fdfTrace("fdfOpenQorvexLog(%s);\n", aPath.c_str());
}

void closeTrace()
{
    if (!gTrace.is_open()) return;
    gTrace.close();
    gTraceActive = false;
    const std::string aPath = fdfWorkingPath("Process.trace");
    if (fqorvFileExists(fdfWorkingPath("Process.trace_save"))) {
        copyFile(aPath, aPath + fdfTimestamp() + ".trace");
        std::this_thread::sleep_for(std::chrono::seconds(1));
    }
}

/// Removes the working file after a successful run, retrying with a pause between tries.
void removeWorkingFile()
{
    for (int aTry = 1; aTry <= 30 && fqorvFileExists(gWorkingFile); ++aTry) {
        if (std::remove(gWorkingFile.c_str()) == 0) break;
        std::this_thread::sleep_for(std::chrono::seconds(static_cast<int>(aTry * 0.1)));
    }
    if (fqorvFileExists(gWorkingFile)) QORV_FATAL(CQORV_ERR_WORKING_FILE_REMOVE, gWorkingFile.c_str());
}

}  // namespace

// ------------------------------------------------------------------------------------------------
// Settings

std::string fdfNormaliseDirectory(const std::string& theDir)
{
    if (theDir.empty()) return theDir;
    std::string aDir = theDir;
    if (aDir.back() == '\\') aDir.back() = '/';
    if (aDir.back() != '/') aDir += '/';
    return aDir;
}

void fdfSetEnvVar(const char* theValue, const char* theKey)
{
    if (!gSettings || !theKey) return;
    for (CSetting& aSetting : *gSettings)
        if (aSetting.mKey.size() == std::strlen(theKey) && aSetting.mKey == theKey) {
            aSetting.mValue = theValue ? theValue : "";
            return;
        }
    if (gSettings->size() == gSettings->capacity()) gSettings->reserve(gSettings->capacity() + 10);
    gSettings->push_back({theKey, theValue ? theValue : ""});
}

int fdfGetEnvVar(char* theBuffer, const char* theKey, std::size_t theSize)
{
    if (!gSettings || !theKey) return -11;
    for (const CSetting& aSetting : *gSettings)
        if (aSetting.mKey == theKey) {
            std::snprintf(theBuffer, theSize, "%s", aSetting.mValue.c_str());
            return 0;
        }
    return -11;
}

std::string fdfGetSetting(const char* theKey)
{
    if (!gSettings || !theKey) return std::string();
    for (const CSetting& aSetting : *gSettings)
        if (aSetting.mKey == theKey) return aSetting.mValue;
    return std::string();
}

bool fdfSettingsExist() { return static_cast<bool>(gSettings); }

void fdfFreeSettings() { gSettings.reset(); }

std::string fdfWorkingPath(const char* theName) { return fdfGetSetting(CQORV_WORKING_DIR) + theName; }

std::string fdfSettingPath(const char* theDirKey, const char* theName) { return fdfGetSetting(theDirKey) + theName; }

// ------------------------------------------------------------------------------------------------
// Bring-up

bool fdfInit(bool theDoFull, const char* theVersionText, bool theNewTrace)
{
    // Stage 1: flags and tables, before anything can fail.
    gReportingMode = true;
    gTraceActive = false;
    gWarningsCounter = 0;
    gVersionText = theVersionText ? theVersionText : "";
    gStartTime = std::chrono::steady_clock::now();
    std::set_new_handler(onMemoryFailure);
    gLineBufferPool.build(CQORV_POOL_NBR);
    fdfSetTitle("-");
    gErrorCatalog.reset();
    gWarningCatalog.reset();
    fdfRegisterFailureCallback(spawnDeferredDeletes);
    gSettings = std::make_unique<std::vector<CSetting>>();
    gSettings->reserve(50);
    gDeleteList.clear();
    gDeleteList.reserve(110);
    // A working file named by the environment is known at once, so that even a failure of the
    // configuration reaches the calling program's result files.
    gWorkingFile = envValue("QORVEX_WORKING_FILE");

    // Stage 2: the configuration.
    std::string aInitDir = envValue("QORVEX_INIT_DIR");
    if (aInitDir.empty()) aInitDir = envValue("windir");
    if (aInitDir.empty()) QORV_FATAL(CQORV_ERR_SETTING_MISSING, "windir");
    const std::string aEnvWorkingDir = fdfNormaliseDirectory(envValue("QORVEX_WORKING_DIR"));
    readConfiguration(fdfNormaliseDirectory(aInitDir) + "Qorvex_configuration.ini", aEnvWorkingDir);

    std::string aBatchDir = envValue("QORVEX_BATCH_DIR");
    if (!aBatchDir.empty()) {
        aBatchDir = fdfNormaliseDirectory(aBatchDir);
        std::cerr << "QORVEX_BATCH_DIR" << " Found = " << aBatchDir << std::endl;
    } else {
        aBatchDir = fdfGetSetting(CQORV_WORKING_DIR);
    }
    fdfSetEnvVar(aBatchDir.c_str(), CQORV_BATCH_DIR);
    if (gWorkingFile.empty()) gWorkingFile = aBatchDir + "Process.working";
    setDummyValue();
    const std::string aGcpDir = envValue("QORVEX_GCP_DATABASE_DIR");
    if (!aGcpDir.empty()) fdfSetEnvVar(fdfNormaliseDirectory(aGcpDir).c_str(), CQORV_GCP_DATABASE_DIR);
    if (!theDoFull) return true;

    // Stage 3: catalogues, trace, log and the working file.
    const std::string aErrors = fdfSettingPath(CQORV_CEOS_DES_FILES_DIR, "qorv_errors_catalog.des");
    const std::string aWarnings = fdfSettingPath(CQORV_CEOS_DES_FILES_DIR, "qorv_warnings_catalog.des");
    if (!gErrorCatalog.read(aErrors.c_str())) QORV_FATAL(CQORV_ERR_MISSING_FILE, aErrors.c_str());
    if (!gWarningCatalog.read(aWarnings.c_str())) QORV_FATAL(CQORV_ERR_MISSING_FILE, aWarnings.c_str());
    openTrace(theNewTrace);
    openLog();
    if (!fqorvFileExists(gWorkingFile)) {
        std::ofstream aWorking(gWorkingFile);
        aWorking << "0\nNO Hostview execution\n";
    }
    fdfTrace("POOL : %d\n", gLineBufferPool.rows());
    return true;
}

// ------------------------------------------------------------------------------------------------
// Title, trace, log, banners

void fdfSetTitle(const char* theTitle)
{
    std::string aTitle = " " + std::string(theTitle ? theTitle : "");
    for (char& c : aTitle)
        if (c == '\n') c = ' ';
    if (aTitle.size() > CQORV_TITLE_MAX) aTitle.resize(CQORV_TITLE_MAX);
    gTitle = aTitle;
}

const char* fdfGetTitle() { return gTitle.c_str(); }

void fdfTrace(const char* theFormat, ...)
{
    if (!gTraceActive || !gTrace.is_open()) return;
    char aBuffer[CQORV_TRACE_BUFFER];
    va_list aArgs;
    va_start(aArgs, theFormat);
    const int aLen = std::vsnprintf(aBuffer, sizeof aBuffer, theFormat, aArgs);
    va_end(aArgs);
    if (aLen < 0) return;
    gTrace << aBuffer;
    gTrace.flush();
}

bool fdfLog(const char* theFormat, ...)
{
    char aBuffer[CQORV_TRACE_BUFFER];
    va_list aArgs;
    va_start(aArgs, theFormat);
    const int aLen = std::vsnprintf(aBuffer, sizeof aBuffer, theFormat, aArgs);
    va_end(aArgs);
    if (aLen < 0) return false;
    if (!gLog.is_open()) return false;
    gLog << aBuffer;
    gLog.flush();
    return static_cast<bool>(gLog);
}

std::string fdfDateText()
{
    const std::time_t aNow = std::time(nullptr);
    char aBuffer[64];
    ctime_r(&aNow, aBuffer);
    return aBuffer;
}

std::string fdfTimestamp()
{
    struct timeval aTv {};
    gettimeofday(&aTv, nullptr);
    struct tm aTm {};
    localtime_r(&aTv.tv_sec, &aTm);
    // The same text as "%04.4d%02.2d%02.2d%02.2d%02.2d%02.2d.%06.6d".
    return fqorvStringFormat("%04d%02d%02d%02d%02d%02d.%06d", aTm.tm_year + 1900, aTm.tm_mon + 1,
                             aTm.tm_mday, aTm.tm_hour, aTm.tm_min, aTm.tm_sec, static_cast<int>(aTv.tv_usec));
}

long long fdfMilliseconds()
{
    return std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::steady_clock::now() - gStartTime).count();
}

void fdfStartBanner(char** theArgv, int theArgc, const char* theTitle, const char* theText)
{
    std::string aText = "\n\n\n" + CQORV_RULE;
    aText += fqorvStringFormat("\nSTART : %s  [ %s ]\n%s", theTitle ? theTitle : "", gVersionText.c_str(),
                               fdfDateText().c_str());
    aText += CQORV_RULE + "\n\n";
    if (theText) {
        aText += theText;
    } else {
        for (int i = 0; i < theArgc; ++i) aText += fqorvStringFormat(" Parameter %d (%s)\n", i, theArgv[i] ? theArgv[i] : "");
    }
    aText += "\n" + CQORV_RULE + "\n\n";
    writeBoth(aText);
}

void fdfEndBanner()
{
    std::string aText = "\n" + CQORV_RULE;
    aText += fqorvStringFormat("\nEND : %s  -  %s\n", gVersionText.c_str(), fdfDateText().c_str());
    aText += CQORV_RULE + "\n\n";
    writeBoth(aText);
}

// ------------------------------------------------------------------------------------------------
// The end of the run

void fdfCloseAll(int theId, bool theClose, bool theSuccess)
{
    if (theClose) {
        if (theId != 0) {
            fdfLog("\n\n-%s   %s\n\n%s\n\nERROR :\n  %s\n\n", fdfGetTitle(), gVersionText.c_str(), fdfDateText().c_str(), " ");
        } else if (theSuccess) {
            fdfLog("\n\nSUCCESSFUL\n\n%s\n\n", fdfDateText().c_str());
        }
        fdfEndBanner();
        gLog.close();
        closeTrace();
    }
    const std::string aTracePath = fdfWorkingPath("Process.trace");
    const std::string aSavedTrace = fdfWorkingPath(("Process_" + fdfTimestamp() + "_trace.txt").c_str());
    if (theId != 0 && fqorvFileExists(aTracePath)) copyFile(aTracePath, aSavedTrace);
    if (theId == 0 && !gWorkingFile.empty() && fqorvFileExists(gWorkingFile)) {
        if (gWarningsCounter > 0) {
            writeResultFiles(CQORV_WARNINGS_PSEUDO_ID, "", static_cast<const char*>(nullptr));
        } else {
            removeWorkingFile();
        }
    }
    const std::string aLogPath = fdfWorkingPath("Process.log");
    struct stat aStat {};
    if (::stat(aLogPath.c_str(), &aStat) == 0 && aStat.st_size > 1000000) {
        copyFile(aLogPath, fdfWorkingPath(("Process_" + fdfTimestamp() + "_trace.txt").c_str()));
        std::remove(aLogPath.c_str());
    }
    if (gWarningsCounter > 0) fqorvExitProcess(CQORV_WARNINGS_PSEUDO_ID);
    if (theId != 0) fqorvExitProcess(theId);
}

QorvFailureCallback fdfRegisterFailureCallback(QorvFailureCallback theCallback)
{
    return std::exchange(gFailureCallback, theCallback);
}

QorvFailureCallback fdfGetFailureCallback() { return gFailureCallback; }

// ------------------------------------------------------------------------------------------------
// Deferred deletion

void fdfAddDeleteFile(const char* theName, bool theFlag)
{
    if (theName) gDeleteList.push_back({theName, theFlag});
}

void fdfClearDeleteFiles() { gDeleteList.clear(); }

void fdfDeleteFiles(bool theReally)
{
    fdfTrace("NUMBER of file to delete : %d\n", static_cast<int>(gDeleteList.size()));
    for (std::size_t i = 0; i < gDeleteList.size(); ++i) {
        const CDeleteEntry& aEntry = gDeleteList[i];
        const bool aDelete = theReally && aEntry.mFlag;
        fdfTrace("[%d%s(%s , %s)\n", static_cast<int>(i), aDelete ? "] deleteFile" : "] NO deleteFile",
                 aEntry.mName.c_str(), aEntry.mFlag ? "true" : "false");
        if (aDelete) std::remove(aEntry.mName.c_str());
    }
}

bool fdfSpawnDeleteFile(const char* theName)
{
    if (!theName) return false;
    const std::string aProgram = fdfSettingPath(CQORV_EXE_DIR, "main_delete_file");
    char* aArgv[] = {const_cast<char*>(aProgram.c_str()), const_cast<char*>(theName), nullptr};
    pid_t aPid = 0;
    return posix_spawn(&aPid, aProgram.c_str(), nullptr, nullptr, aArgv, environ) == 0;
}
