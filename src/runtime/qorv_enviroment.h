// Run-time environment: configuration, settings table, trace, log, banners and the end of a run.
//
// A run starts with fdfInit, which reads the 14-line Qorvex_configuration.ini found through the
// environment variable QORVEX_INIT_DIR, and ends with fdfCloseAll. Directory settings are kept
// with a trailing '/', so that a file name is joined to them by plain concatenation.
#pragma once

#include <fstream>
#include <string>

/// The version text of the chain.
inline constexpr const char* CQORV_VERSION_TEXT = "Qorvex Base ENVI  4.3.000Jan 13 2011 ";

// Setting keys, in the order of the lines of Qorvex_configuration.ini (line 13 has no key).
inline constexpr const char* CQORV_KEY_FILES_DIR = "QORVEX_KEY_FILES_DIR";
inline constexpr const char* CQORV_MANDATORY_DIR = "QORVEX_MANDATORY_DIR";
inline constexpr const char* CQORV_WORKING_DIR = "QORVEX_WORKING_DIR";
inline constexpr const char* CQORV_EXE_DIR = "QORVEX_EXE_DIR";
inline constexpr const char* CQORV_MAP_FILES_DIR = "QORVEX_MAP_FILES_DIR";
inline constexpr const char* CQORV_CEOS_DES_FILES_DIR = "QORVEX_CEOS_DES_FILES_DIR";
inline constexpr const char* CQORV_GCP_DATABASE_DIR = "QORVEX_GCP_DATABASE_DIR";
inline constexpr const char* CQORV_ZENTA_DES_FILES_DIR = "QORVEX_ZENTA_DES_FILES_DIR";
inline constexpr const char* CQORV_OTHER_01_DES_FILES_DIR = "QORVEX_OTHER_01_DES_FILES_DIR";
inline constexpr const char* CQORV_XML_SCHEMA_DES_FILES_DIR = "QORVEX_XML_SCHEMA_DES_FILES_DIR";
inline constexpr const char* CQORV_DEFAULT_BYTE_ORDER = "QORVEX_DEFAULT_BYTE_ORDER";
inline constexpr const char* CQORV_TRACING = "QORVEX_TRACING";
inline constexpr const char* CQORV_DUMMY_VALUE = "QORVEX_DUMMY_VALUE";
inline constexpr const char* CQORV_BATCH_DIR = "QORVEX_BATCH_DIR";

inline constexpr int CQORV_CONFIG_LINES = 14;
inline constexpr int CQORV_TITLE_MAX = 80;
inline constexpr std::size_t CQORV_TRACE_BUFFER = 25000;

// Process-wide state that the rest of the system reads.
extern bool gTraceActive;
extern std::ofstream gTrace;
extern std::ofstream gLog;
extern int gTraceLevel;
extern std::string gWorkingFile;
extern std::string gVersionText;
extern float gDummyFloat;
extern double gDummyDouble;

/// Brings the run up. The driver calls it with true, the version text and true. Failures:
/// 783360 ("windir") without QORVEX_INIT_DIR, 261122 without a configuration file, 783360 for a
/// configuration of fewer than 14 lines.
bool fdfInit(bool theDoFull, const char* theVersionText, bool theNewTrace);

/// Sets the current title: " %s", line feeds made blanks, cut at 80 characters.
void fdfSetTitle(const char* theTitle);
const char* fdfGetTitle();

/// Settings table (not the operating system's environment).
void fdfSetEnvVar(const char* theValue, const char* theKey);
/// Copies the value into theBuffer (at most theSize bytes with the terminator) and returns 0;
/// returns -11 and leaves the buffer alone for a key that is not in the table.
int fdfGetEnvVar(char* theBuffer, const char* theKey, std::size_t theSize = 512);
/// The value of a setting, or an empty text when the key is not in the table.
std::string fdfGetSetting(const char* theKey);
/// True when the settings table exists (between fdfInit and the end of the run).
bool fdfSettingsExist();
/// Frees the settings table.
void fdfFreeSettings();

/// Trace and log. fdfTrace does nothing while gTraceActive is false. Both flush after every call.
void fdfTrace(const char* theFormat, ...) __attribute__((format(printf, 1, 2)));
bool fdfLog(const char* theFormat, ...) __attribute__((format(printf, 1, 2)));

void fdfStartBanner(char** theArgv, int theArgc, const char* theTitle, const char* theText);
void fdfEndBanner();

/// The end-of-process sequence. Ends the process when theId is not 0 (or warnings were counted).
void fdfCloseAll(int theId, bool theClose, bool theSuccess);

using QorvFailureCallback = void (*)(int theId);
/// Registers the function called with the id at the start of writeResultFiles; returns the old one.
QorvFailureCallback fdfRegisterFailureCallback(QorvFailureCallback theCallback);
QorvFailureCallback fdfGetFailureCallback();

/// Deferred deletion: a list of file names, removed by fdfDeleteFiles or, on a failure, by the
/// helper program main_delete_file started for each entry.
void fdfAddDeleteFile(const char* theName, bool theFlag);
void fdfDeleteFiles(bool theReally);
void fdfClearDeleteFiles();
/// Starts main_delete_file of QORVEX_EXE_DIR with the name, without waiting.
bool fdfSpawnDeleteFile(const char* theName);

/// Gives the standard streams back their own buffers (the trace redirects them to files).
void fdfRestoreStandardStreams();

/// "%04d%02d%02d%02d%02d%02d.%06d" of the local time now.
std::string fdfTimestamp();
/// The standard ctime text of now, with its line feed.
std::string fdfDateText();
/// Milliseconds of a monotonic clock.
long long fdfMilliseconds();

/// Path of a file in the working directory.
std::string fdfWorkingPath(const char* theName);
/// Path of a file in the directory named by a setting (which ends in '/').
std::string fdfSettingPath(const char* theDirKey, const char* theName);
/// A directory value with its trailing separator made '/' (a '\\' is replaced, a missing one added).
std::string fdfNormaliseDirectory(const std::string& theDir);

/// Names of days and months of the date helpers, spelled as the system has them.
extern const char* const CQORV_DAY_NAMES[7];
extern const char* const CQORV_MONTH_NAMES[12];
