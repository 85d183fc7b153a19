// Failure reporting: ids, catalogues, result files and the end of a failed process.
//
// A failure id is PEC * 65280 + SEC + 1, with PEC the primary error code and SEC the zero-based
// secondary code. Texts live in the catalogue files qorv_errors_catalog.des and
// qorv_warnings_catalog.des, never in the program. A function that meets a failure calls
// QORV_FATAL where it stands; the call writes the result files, trace and log and ends the process.
#pragma once

#include <string>
#include <vector>

inline constexpr int CQORV_PEC_FACTOR = 65280;

// Failure ids (decimal). The words of each stand in the error catalogue.
inline constexpr int CQORV_ERR_WRONG_REQUEST = 130560;          // request or datum the step can't process
inline constexpr int CQORV_ERR_GEO_MEMORY = 195840;             // no memory in geometry or export code
inline constexpr int CQORV_ERR_WORKING_FILE_REMOVE = 261120;    // working file can't be removed at the end
inline constexpr int CQORV_ERR_RASTER_ACCESS = 261121;          // raster access outside limits, wrong mode
inline constexpr int CQORV_ERR_MISSING_FILE = 261122;           // a needed input file is missing
inline constexpr int CQORV_ERR_CREATE_FILE = 261123;            // an output or work file can't be created
inline constexpr int CQORV_ERR_WRITE_FILE = 261124;             // a file can't be written
inline constexpr int CQORV_ERR_RASTER_READ = 261125;            // a raster can't be read
inline constexpr int CQORV_ERR_NO_NON_NULL_POINTS = 261126;     // no non-null point in the input file
inline constexpr int CQORV_ERR_OPERATOR_STOP = 326400;          // operator stop, progress file not creatable
inline constexpr int CQORV_ERR_NUMERIC_INPUT = 456960;          // a numerical routine refused its input
inline constexpr int CQORV_ERR_WINDOW_TOO_SMALL = 456961;       // window size too small
inline constexpr int CQORV_ERR_ARGUMENT_COUNT = 456962;         // wrong number of arguments
inline constexpr int CQORV_ERR_POLYNOMIAL_ORDER = 456965;       // a polynomial routine refused its order
inline constexpr int CQORV_ERR_MEMORY = 522240;                 // no memory for a processing buffer
inline constexpr int CQORV_ERR_GEOCODING_FIELD = 587520;        // a geocoding field holds no usable value
inline constexpr int CQORV_ERR_POST_FOCUS_2 = 652802;           // post-focus operations refused their raster
inline constexpr int CQORV_ERR_POST_FOCUS_3 = 652803;
inline constexpr int CQORV_ERR_POST_FOCUS_4 = 652804;
inline constexpr int CQORV_ERR_RASTER_SIZES_DIFFER = 652807;    // two rasters' sizes differ
inline constexpr int CQORV_ERR_SETTING_MISSING = 783360;        // a setting of the environment is missing
inline constexpr int CQORV_ERR_SETTING_VALUE = 783361;          // a setting of the environment holds an unknown value
inline constexpr int CQORV_ERR_KEY_FILE = 848640;               // a key file's content is wrong
inline constexpr int CQORV_ERR_MANDATORY = 848641;              // a mandatory file or a field's value is wrong
inline constexpr int CQORV_ERR_UNKNOWN_KEY = 848642;            // unknown field key
inline constexpr int CQORV_ERR_FIELD_TYPE = 848644;             // data type or structure differs
inline constexpr int CQORV_ERR_FIELD_NOT_SET = 848645;          // element not set
inline constexpr int CQORV_ERR_INDEX_RANGE = 848646;            // index out of range, all pools busy
inline constexpr int CQORV_ERR_IMPOSSIBLE_VALUE = 848647;       // a raw header's value is impossible for a spaceborne SAR
inline constexpr int CQORV_ERR_CATCH_ALL = 913920;              // exception in a catch-all handler
inline constexpr int CQORV_ERR_RASTER_EXCEPTION = 913921;       // exception in raster input or output
inline constexpr int CQORV_ERR_MAP_ENVIRONMENT = 913922;        // failure in the map code's environment
inline constexpr int CQORV_ERR_IMPORT_UNKNOWN_INPUT = 979201;    // not a raw archive of a known format
inline constexpr int CQORV_ERR_IMPORT_LEADER = 979202;           // leader file missing or of another kind
inline constexpr int CQORV_ERR_IMPORT_RECORD_LENGTH = 979203;    // record lengths contradict the descriptor
inline constexpr int CQORV_ERR_IMPORT_LAYOUT = 979204;           // facility layout of the records not recognised
inline constexpr int CQORV_ERR_IMPORT_CODE_RANGE = 979205;       // a PRI or SWST code out of range
inline constexpr int CQORV_ERR_IMPORT_TIME_ORDER = 979206;       // times go backwards
inline constexpr int CQORV_ERR_IMPORT_ORBIT_COVERAGE = 979207;   // the orbit does not cover the scene
inline constexpr int CQORV_ERR_IMPORT_OPTION = 979208;           // an option does not apply to this input
inline constexpr int CQORV_ERR_IMPORT_NO_LINES = 979209;         // the input holds no whole line
inline constexpr int CQORV_ERR_IMPORT_VALUE = 979210;            // a value of the archive missing or impossible
inline constexpr int CQORV_ERR_IMPORT_ORBIT_FILE = 979211;       // the orbit file cannot be read
inline constexpr int CQORV_ERR_IMPORT_OUTSIDE_FILE = 979212;     // an outside file the product needs is not given
inline constexpr int CQORV_ERR_IMPORT_OUTSIDE_KIND = 979213;     // an outside file of the wrong kind or size
inline constexpr int CQORV_ERR_IMPORT_PRF_SWITCH = 979214;       // the leader's PRF switch contradicts the lines
inline constexpr int CQORV_WARNINGS_PSEUDO_ID = 65280;          // a run that ended with warnings

// Warning ids, numbered in the warning catalogue.
inline constexpr int CQORV_WARN_65281 = 65281;
inline constexpr int CQORV_WARN_COORDINATES = 65283;           // scene coordinates missing, derived instead
inline constexpr int CQORV_WARN_PRECISE_FALLBACK = 65284;      // the precise azimuth mode fell back to the block mode
inline constexpr int CQORV_WARN_130561 = 130561;
inline constexpr int CQORV_WARN_IMPORT_TRUNCATED = 195841;     // data file truncated, its whole lines imported
inline constexpr int CQORV_WARN_IMPORT_ONE_VECTOR = 195842;    // orbit propagated from a single state vector
inline constexpr int CQORV_WARN_IMPORT_CLOCK = 195843;         // on-board clock off the scene time

inline constexpr int CQORV_MAX_LINE_IN_ERROR = 3;
inline constexpr int CQORV_MAX_LEN_IN_ERROR = 48;
inline constexpr int CQORV_CATALOG_TEXT_LEN = 1026;

inline int fqorvPEC(int theId) { return theId / CQORV_PEC_FACTOR; }
inline int fqorvSEC(int theId) { return theId % CQORV_PEC_FACTOR - 1; }

/// The value that carries a failure when the reporting mode is not yet set; thrown by value.
class CErrorExceptionManager {
public:
    CErrorExceptionManager(int theId, int theLine, const char* theFile, const char* theTitle,
                           const char* theParameter);

    char mTitle[25000];
    char mFile[260];
    int mLine;
    int mId;
    int mPEC;
    int mSEC;
    char mPrimaryText[1026];
    char mSecondaryText[1026];
    char mParameter[1028];
};

/// One failure catalogue (errors or warnings), read from a catalogue file.
class CErrorCatalog {
public:
    /// Reads a catalogue file; false when it can't be opened (the catalogue then stays empty).
    bool read(const char* thePath);
    void reset();
    bool isEmpty() const { return mPECNbr == 0; }

    /// Texts of an id as the trace and the log show them.
    void getErrorText(int theId, char* thePrimary, char* theSecondary) const;
    /// Texts of an id as the result files show them, with texts of their own for wrong codes.
    void getPrimaryText(int theId, char* theBuffer) const;
    void getSecondaryText(int theId, char* theBuffer) const;

    int mWarningNbr = 0;
    int mPECNbr = 0;
    std::vector<std::string> mPECTexts;
    std::vector<int> mSECNbr;
    std::vector<std::vector<std::string>> mSECTexts;
};

extern CErrorCatalog gErrorCatalog;
extern CErrorCatalog gWarningCatalog;
/// Set by fdfInit before anything can fail; until then a failure is thrown as CErrorExceptionManager.
extern bool gReportingMode;
/// Counter of warnings that end a run with the pseudo id 65280; nothing raises it.
extern int gWarningsCounter;

/// Writes the result files that the calling program watches: `W`_error, the working file itself
/// (or `W`_tmp when it can't be opened). Takes parameter strings ended by a null.
bool writeResultFiles(int theId, const char* theParameter, ...);

/// The failure road. Never returns.
[[noreturn]] void fqorvFatal(int theId, const char* theParameter, const char* theFile, int theLine);
void fqorvWarning(int theId, const char* theParameter, const char* theFile, int theLine);
[[noreturn]] void fqorvSuccess(const char* theFile, int theLine);

#define QORV_FATAL(id, parameter) fqorvFatal((id), (parameter), __FILE__, __LINE__)
#define QORV_WARNING(id, parameter) fqorvWarning((id), (parameter), __FILE__, __LINE__)
#define QORV_SUCCESS() fqorvSuccess(__FILE__, __LINE__)

/// Exit status of the process for a failure id. A POSIX status keeps 8 bits, and ids that are
/// multiples of 256 would read as success, so the status is the primary code (1 to 254) or 255
/// for an id whose primary code is 0 or above 254. Id 0 alone gives 0.
int fqorvExitStatus(int theId);

/// Ends the process for an id: writes "QORVEX EXIT ID: <id>" as the last line on the real standard
/// error (file descriptor 2, never redirected) and exits with fqorvExitStatus(id). Tests may replace
/// the exit through fdfSetExitHandler.
[[noreturn]] void fqorvExitProcess(int theId);

using QorvExitHandler = void (*)(int theId);
/// Replaces the process end (default: std::exit with the mapped status); returns the previous one.
/// A handler that returns is followed by std::exit.
QorvExitHandler fdfSetExitHandler(QorvExitHandler theHandler);

/// Exceptions of the small maths layer.
class DSPException {
public:
    explicit DSPException(const char* theWhat = "Math Error") : mWhat(theWhat) {}
    virtual ~DSPException() = default;
    const char* what() const { return mWhat; }
private:
    const char* mWhat;
};
class DSPParamException : public DSPException {
public:
    explicit DSPParamException(const char* w = "Parameter Error") : DSPException(w) {}
};
class DSPMemoryException : public DSPException {
public:
    explicit DSPMemoryException(const char* w = "Memory Error") : DSPException(w) {}
};
class DSPMathException : public DSPException {
public:
    explicit DSPMathException(const char* w = "Math Error") : DSPException(w) {}
};
class DSPBoundaryException : public DSPException {
public:
    explicit DSPBoundaryException(const char* w = "Boundary Error") : DSPException(w) {}
};
