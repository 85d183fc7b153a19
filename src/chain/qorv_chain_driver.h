// The chain driver: reads the arguments file, works out the step list, names the files of each
// product and runs the steps of the step table one after the other.
#pragma once

#include <string>
#include <vector>

/// A step has the shape of a program entry: element 0 of the vector is its title.
using QorvStepFunction = int (*)(int theArgc, char** theArgv);

/// One row of the step table: title, run function, shut function (removes intermediate files).
struct CStepRow {
    const char* mTitle;
    QorvStepFunction mRun;
    QorvStepFunction mShut;
};

inline constexpr int CQORV_STEP_NBR = 9;
inline constexpr int CQORV_FOC_INPUT_PARAM_NBR = 19;
inline constexpr const char* CQORV_RUN_TITLE = "Focussing and multilooking";
inline constexpr const char* CQORV_FOC_LIST_SUFFIX = "_foc.list";

/// The nine steps, in index order.
extern const CStepRow CQORV_STEP_TABLE[CQORV_STEP_NBR];

/// The default shut function: does nothing and returns 1.
int fdfDefaultShut(int theArgc, char** theArgv);

/// Works out the running order of the steps (flags from arguments 1, 5, 14, 15, 16, 10, 17, 6).
/// Writes the step indices into theSteps (room for 10 + 4 per further file) and returns their number.
int fdfBuildStepList(bool theFocus, bool theMultiLook, bool theParameters, bool theAzimuthSpectrum,
                     bool theRangeCompression, bool theDopplerAmbiguity, bool theAutofocus, bool theTiff,
                     int theNbrOfFiles, int* theSteps);
std::vector<int> fdfBuildStepList(bool theFocus, bool theMultiLook, bool theParameters, bool theAzimuthSpectrum,
                                  bool theRangeCompression, bool theDopplerAmbiguity, bool theAutofocus,
                                  bool theTiff, int theNbrOfFiles);

/// Reads the arguments file named by the command-line text (falling back to its name in the
/// working directory); drops its first line. Missing file or fewer than two lines: 261122.
std::vector<std::string> fdfReadArgumentsFile(const std::string& theCommandLine);

/// The state of one run: arguments, input list and the names kept through the run.
class CChainRun {
public:
    CChainRun(std::vector<std::string> theArgs, std::vector<std::string> theFileList);

    /// Flags of the arguments: "OK" arguments and the four that are true unless "OK".
    bool focus() const { return isOk(1); }
    bool multiLook() const { return isOk(5); }
    bool tiff() const { return isOk(6); }
    bool deleteIntermediate() const { return isOk(7); }
    bool dopplerAmbiguity() const { return isOk(10); }
    bool endIfInputMissing() const { return isOk(11); }
    bool parameters() const { return !isOk(14); }
    bool azimuthSpectrum() const { return !isOk(15); }
    bool rangeCompression() const { return !isOk(16); }
    bool autofocus() const { return !isOk(17); }

    /// The step list of this run.
    std::vector<int> stepList() const;

    /// Elements 1 onward of a step's argument vector. For step 0 the product's root is set first;
    /// before steps 2 and 5 of a list the header chain runs, and before step 5 the file index
    /// moves on.
    std::vector<std::string> stepArguments(int theStep);

    /// The root of the products of input file theFileIndex (argument 2, or the file's own name).
    std::string productRoot(int theFileIndex) const;
    /// Refuses (456962, the product's name) a run in which a product or its header would stand in
    /// place of one of the run's inputs: the listed files, the list file and their headers.
    void checkProductNames() const;

    /// Runs the steps of a list through a table; returns the status of the last step run.
    int runStepList(const CStepRow* theTable, const std::vector<int>& theSteps);

    void setDopPolDeg(const std::string& theDeg) { mDopPolDeg = theDeg; }
    const std::string& root() const { return mRoot; }
    const std::string& keepRoot() const { return mKeepRoot; }
    const std::string& refRoot() const { return mRefRoot; }
    const std::string& currentInput() const { return mCurrentInput; }
    int fileIndex() const { return mFileIndex; }
    int argCount() const { return static_cast<int>(mArgs.size()); }
    int nbrOfFiles() const { return static_cast<int>(mFileList.size()); }
    const std::string& arg(int i) const { return mArgs[static_cast<std::size_t>(i)]; }

private:
    bool isOk(int i) const { return i < static_cast<int>(mArgs.size()) && mArgs[static_cast<std::size_t>(i)] == "OK"; }
    void setRoot();
    void applyHeaderChainBeforeRangeCompression();
    void applyHeaderChainBeforeFocusing();

    std::vector<std::string> mArgs;
    std::vector<std::string> mFileList;
    bool mFromList = false;  // argument 0 is a list file
    std::string mRoot;
    bool mRootSet = false;
    std::string mKeepRoot;
    std::string mRefRoot;
    std::string mCurrentInput;
    int mFileIndex = 0;
    std::string mDopPolDeg = "1";
};

/// The program's entry: the whole run for a command-line text (the arguments file's path).
/// Returns the status of the last step; failures end the process where they are found.
int main_chain_driver(const std::string& theCommandLine, const CStepRow* theTable = CQORV_STEP_TABLE);
