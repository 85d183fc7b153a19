#include "qorv_chain_driver.h"

#include <cstring>
#include <filesystem>
#include <memory>
#include <set>

#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"
#include "qorv_header_chain.h"
#include "qorv_prf_extraction.h"
#include "qorv_progress.h"
#include "qorv_raw_header_checks.h"

// ------------------------------------------------------------------------------------------------
// Step list

int fdfBuildStepList(bool theFocus, bool theMultiLook, bool theParameters, bool theAzimuthSpectrum,
                     bool theRangeCompression, bool theDopplerAmbiguity, bool theAutofocus, bool theTiff,
                     int theNbrOfFiles, int* theSteps)
{
    int n = 0;
    // The first product carries all estimation steps; autofocus refines the parameter file in
    // place and runs three times; Doppler ambiguity comes before it although its index is higher.
    if (theParameters) theSteps[n++] = 0;
    if (theFocus) {
        if (theAzimuthSpectrum) theSteps[n++] = 1;
        if (theRangeCompression) theSteps[n++] = 2;
        if (theDopplerAmbiguity) theSteps[n++] = 4;
        if (theAutofocus) {
            theSteps[n++] = 3;
            theSteps[n++] = 3;
            theSteps[n++] = 3;
        }
        theSteps[n++] = 5;
    }
    if (theTiff && !theMultiLook) theSteps[n++] = 8;
    if (theMultiLook) {
        theSteps[n++] = 6;
        if (theTiff) theSteps[n++] = 7;
    }
    // Further products reuse what the first one established: never steps 1, 3, 4 or 8.
    for (int aFile = 1; aFile < theNbrOfFiles; ++aFile) {
        theSteps[n++] = 0;
        if (theFocus) {
            if (theRangeCompression) theSteps[n++] = 2;
            theSteps[n++] = 5;
        }
        if (theMultiLook) {
            theSteps[n++] = 6;
            if (theTiff) theSteps[n++] = 7;
        }
    }
    return n;
}

std::vector<int> fdfBuildStepList(bool theFocus, bool theMultiLook, bool theParameters, bool theAzimuthSpectrum,
                                  bool theRangeCompression, bool theDopplerAmbiguity, bool theAutofocus,
                                  bool theTiff, int theNbrOfFiles)
{
    const int aFiles = theNbrOfFiles > 0 ? theNbrOfFiles : 1;
    std::vector<int> aSteps(static_cast<std::size_t>(10 + 4 * aFiles));
    const int n = fdfBuildStepList(theFocus, theMultiLook, theParameters, theAzimuthSpectrum, theRangeCompression,
                                   theDopplerAmbiguity, theAutofocus, theTiff, theNbrOfFiles, aSteps.data());
    aSteps.resize(static_cast<std::size_t>(n));
    return aSteps;
}

// ------------------------------------------------------------------------------------------------
// Arguments file

std::vector<std::string> fdfReadArgumentsFile(const std::string& theCommandLine)
{
    std::string aPath = theCommandLine;
    if (!fqorvFileExists(aPath)) {
        const std::size_t aSlash = aPath.find_last_of("/\\");
        aPath = fdfGetSetting(CQORV_WORKING_DIR) + (aSlash == std::string::npos ? aPath : aPath.substr(aSlash + 1));
        if (!fqorvFileExists(aPath)) QORV_FATAL(CQORV_ERR_MISSING_FILE, theCommandLine.c_str());
    }
    std::vector<std::string> aLines;
    const CQorvTextRead aRead = fqorvReadTextFile(aPath.c_str(), aLines);
    if (aRead != CQorvTextRead::Ok && aRead != CQorvTextRead::Missing) {
        // A NUL would cut a name short where the step opens it; a line without end is no argument.
        fdfTrace("\nThe arguments file %s %s\n", aPath.c_str(), fqorvTextReadWords(aRead));
        QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, theCommandLine.c_str());
    }
    if (aRead != CQorvTextRead::Ok || aLines.size() < 2) QORV_FATAL(CQORV_ERR_MISSING_FILE, theCommandLine.c_str());
    aLines.erase(aLines.begin());
    return aLines;
}

// ------------------------------------------------------------------------------------------------
// Names and argument vectors

CChainRun::CChainRun(std::vector<std::string> theArgs, std::vector<std::string> theFileList)
    : mArgs(std::move(theArgs)), mFileList(std::move(theFileList))
{
    if (!mFileList.empty()) mCurrentInput = mFileList.front();
    mFromList = !mArgs.empty() && fqorvEndsWith(mArgs[0], CQORV_FOC_LIST_SUFFIX);
}

std::vector<int> CChainRun::stepList() const
{
    return fdfBuildStepList(focus(), multiLook(), parameters(), azimuthSpectrum(), rangeCompression(),
                            dopplerAmbiguity(), autofocus(), tiff(), nbrOfFiles());
}

std::string CChainRun::productRoot(int theFileIndex) const
{
    // A single input file takes argument 2; the products of a list file, even of a one-line
    // list, are named from their own file names.
    if (!mFromList) return fqorvCutSuffix(arg(2), focus() ? "_slc" : "_pwr");
    const std::string& aInput = mFileList[static_cast<std::size_t>(theFileIndex)];
    return fqorvCutSuffix(fqorvCutSuffix(fqorvCutSuffix(aInput, "_raw"), "_slc"), "_pwr");
}

namespace {

/// A file's identity for the overwrite check: the absolute, lexically normal path of its name
/// without the header endings, so that a raster and its header count as one.
std::string fileIdentity(const std::string& theName)
{
    std::error_code aError;
    const std::string aBase = fqorvCutSuffix(fqorvCutSuffix(theName, "_hdr"), ".sml");
    std::filesystem::path aPath = std::filesystem::absolute(aBase, aError);
    if (aError) aPath = aBase;
    return aPath.lexically_normal().string();
}

}  // namespace

void CChainRun::checkProductNames() const
{
    std::set<std::string> aInputs;
    for (const std::string& aFile : mFileList) aInputs.insert(fileIdentity(aFile));
    if (mFromList) aInputs.insert(fileIdentity(mArgs[0]));
    // Only what a step of this run writes counts: step 8 alone reads the SLC it converts.
    static const char* const CWRITTEN_BY_STEP[][3] = {
        {"_par", nullptr, nullptr}, {"_azsp", nullptr, nullptr}, {"_rc", "_ref_rc", nullptr},
        {nullptr, nullptr, nullptr}, {"_rc__amb1_mli", "_rc__amb2_mli", nullptr}, {"_slc", nullptr, nullptr},
        {"_pwr", nullptr, nullptr}, {"_pwr.tif", nullptr, nullptr}, {"_slc.tif", nullptr, nullptr}};
    std::set<std::string> aSuffixes;
    for (int aStep : stepList())
        for (const char* aSuffix : CWRITTEN_BY_STEP[aStep])
            if (aSuffix != nullptr) aSuffixes.insert(aSuffix);
    for (int aFile = 0; aFile < nbrOfFiles(); ++aFile) {
        const std::string aRoot = productRoot(aFile);
        for (const std::string& aSuffix : aSuffixes) {
            const std::string aProduct = aRoot + aSuffix;
            if (aInputs.count(fileIdentity(aProduct)) == 0) continue;
            fdfTrace("\nThe product %s would overwrite an input of this run\n", aProduct.c_str());
            QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, aProduct.c_str());
        }
    }
}

void CChainRun::setRoot()
{
    mCurrentInput = mFileList[static_cast<std::size_t>(mFileIndex)];
    mRoot = productRoot(mFileIndex);
    if (!mFromList) {
        mKeepRoot = mRoot;
    } else {
        if (mFileIndex == 0) {
            mKeepRoot = mRoot;
            mRefRoot = mRoot + "_ref";
        }
    }
    mRootSet = true;
}

void CChainRun::applyHeaderChainBeforeRangeCompression()
{
    if (nbrOfFiles() < 2 || mFileIndex == 0) return;
    fdfInheritHeader(mFileList.front().c_str(), mCurrentInput.c_str(), "");
    fdfInheritHeader(mKeepRoot.c_str(), mRoot.c_str(), "_par");
}

void CChainRun::applyHeaderChainBeforeFocusing()
{
    if (nbrOfFiles() < 2) return;
    if (mFileIndex == 0) {
        // The first product's range compressed header is kept as the reference of the list.
        fdfCopyHeader((mRoot + "_rc").c_str(), (mRefRoot + "_rc").c_str(), "_hdr");
    } else {
        fdfInheritHeader(mKeepRoot.c_str(), mRoot.c_str(), "_par");
        fdfInheritHeader(mRefRoot.c_str(), mRoot.c_str(), "_rc");
        fdfCopyHeader((mRefRoot + "_rc").c_str(), (mRoot + "_rc").c_str(), "_hdr");
    }
}

std::vector<std::string> CChainRun::stepArguments(int theStep)
{
    // Step 0 sets the product's root. A run that skips step 0 gets the same root all the same.
    if (theStep == 0 || !mRootSet) setRoot();
    const std::string& r = mRoot;
    const std::string& aInput = mCurrentInput;
    switch (theStep) {
    case 0:
        return {r + "_par", aInput};
    case 1:
        return {aInput, r + "_par", r + "_azsp", "8", mDopPolDeg};
    case 2:
        applyHeaderChainBeforeRangeCompression();
        return {aInput, r + "_rc", r + "_par"};
    case 3:
    case 4:
        return {r + "_rc", r + "_par"};
    case 5: {
        applyHeaderChainBeforeFocusing();
        ++mFileIndex;  // the next step 0 finds the next file; the only place where it moves
        if (mFileIndex >= nbrOfFiles()) mFileIndex = nbrOfFiles() - 1;
        return {r + "_rc", r + "_slc", r + "_par", "1", "1", "8192", "0", "0", "-1", arg(12) == "NotOK" ? "-1" : arg(12)};
    }
    case 6: {
        const std::string aImage = focus() ? r + "_slc" : aInput;
        fdfTrace("Multi look input file : %s\n", aImage.c_str());
        return {aImage, r + "_pwr", r + "_par", arg(3), arg(4), arg(9), arg(7), arg(13), arg(18)};
    }
    case 7:
        return {r + "_pwr", r + "_pwr.tif", arg(8)};
    case 8:
        return {r + "_slc", r + "_slc.tif", arg(8), "1", "1"};
    default:
        return {};
    }
}

// ------------------------------------------------------------------------------------------------
// The step loop

int CChainRun::runStepList(const CStepRow* theTable, const std::vector<int>& theSteps)
{
    int aStatus = 0;
    for (std::size_t i = 0; i < theSteps.size(); ++i) {
        const CStepRow& aRow = theTable[theSteps[i]];
        fdfTrace("\nStep (%d) %s", static_cast<int>(i), aRow.mTitle);
        fdfSetTitle(aRow.mTitle);
        getAndSetPerc(-1, 0, fdfGetTitle());
        if (!getAndSetPerc(-1, 0, nullptr)) {
            fdfTrace("\n EXECUTION INTERRUPTED BY OPERATOR\n");
            QORV_FATAL(CQORV_ERR_OPERATOR_STOP, nullptr);
        }

        std::vector<std::string> aArgs{fdfGetTitle()};
        for (std::string& a : stepArguments(theSteps[i])) aArgs.push_back(std::move(a));
        std::vector<char*> aArgv;
        for (std::size_t k = 0; k < aArgs.size(); ++k) {
            fdfTrace("\naArgv[%d] = %s", static_cast<int>(k), aArgs[k].c_str());
            aArgv.push_back(aArgs[k].data());
        }
        aArgv.push_back(nullptr);
        const int aArgc = static_cast<int>(aArgs.size());

        const long long aBefore = fdfMilliseconds();
        aStatus = aRow.mRun(aArgc, aArgv.data());
        const double aSeconds = static_cast<double>(fdfMilliseconds() - aBefore) / 1000.0;
        fdfTrace("\n%s\nDURATION [%s]  (s) = %f\n%s  END \n", fdfGetTitle(), fdfGetTitle(), aSeconds, fdfGetTitle());
        if (aStatus != 0) break;
        if (deleteIntermediate() && aRow.mShut) aRow.mShut(aArgc, aArgv.data());
    }
    return aStatus;
}

// ------------------------------------------------------------------------------------------------
// The run

namespace {

/// Stages 3 to 6 of the run: arguments, banner, checks and the input list.
std::unique_ptr<CChainRun> prepareRun(const std::string& theCommandLine)
{
    std::vector<std::string> aArgs = fdfReadArgumentsFile(theCommandLine);
    std::vector<char*> aArgv;
    for (std::string& a : aArgs) aArgv.push_back(a.data());
    fdfStartBanner(aArgv.data(), static_cast<int>(aArgv.size()), CQORV_RUN_TITLE, nullptr);
    if (static_cast<int>(aArgs.size()) < CQORV_FOC_INPUT_PARAM_NBR)
        QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, theCommandLine.c_str());
    for (std::size_t i = 0; i < aArgs.size(); ++i) fdfTrace("\nargv[%d] = %s", static_cast<int>(i), aArgs[i].c_str());

    std::vector<std::string> aFileList;
    if (fqorvEndsWith(aArgs[0], CQORV_FOC_LIST_SUFFIX)) {
        std::vector<std::string> aLines;
        const CQorvTextRead aRead = fqorvReadTextFile(aArgs[0].c_str(), aLines);
        if (aRead == CQorvTextRead::Missing) QORV_FATAL(CQORV_ERR_MISSING_FILE, aArgs[0].c_str());
        if (aRead != CQorvTextRead::Ok) {
            fdfTrace("\nThe list file %s %s\n", aArgs[0].c_str(), fqorvTextReadWords(aRead));
            QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, aArgs[0].c_str());
        }
        for (std::string& aLine : aLines)
            if (!aLine.empty()) aFileList.push_back(std::move(aLine));
        if (aFileList.empty()) QORV_FATAL(CQORV_ERR_ARGUMENT_COUNT, aArgs[0].c_str());
    } else {
        aFileList.push_back(aArgs[0]);
    }
    auto aRun = std::make_unique<CChainRun>(std::move(aArgs), std::move(aFileList));
    aRun->checkProductNames();
    return aRun;
}

int runChain(const std::string& theCommandLine, const CStepRow* theTable, long long theStart)
{
    std::unique_ptr<CChainRun> aRun = prepareRun(theCommandLine);
    // A run asked to end quietly when its input is missing ends before anything reads the input.
    if (aRun->endIfInputMissing() && !fqorvFileExists(aRun->currentInput())) QORV_SUCCESS();
    // The first product's raw header rules the run: later products of a list take it at step 2.
    if (fdfStepsReadRawEchoes(aRun->stepList())) fdfCheckRawHeaderOf(aRun->currentInput());
    fdfExtractPrfChanges(aRun->currentInput().c_str());

    fdfTrace("\naNbrOfVal = %d  CQORV_FOC_INPUT_PARAM_NBR = %d", aRun->argCount(), CQORV_FOC_INPUT_PARAM_NBR);
    if (aRun->argCount() > CQORV_FOC_INPUT_PARAM_NBR && aRun->arg(19).find("NotOK") == std::string::npos) {
        aRun->setDopPolDeg(aRun->arg(19));
        fdfTrace("\naDopPolDeg = %s", aRun->arg(19).c_str());
    }
    const int aStatus = aRun->runStepList(theTable, aRun->stepList());
    fdfTrace("\nFOC TOTAL TIME (s): %f\n", static_cast<double>(fdfMilliseconds() - theStart) / 1000.0);
    return aStatus;
}

}  // namespace

int main_chain_driver(const std::string& theCommandLine, const CStepRow* theTable)
{
    const long long aStart = fdfMilliseconds();
    fdfInit(true, CQORV_VERSION_TEXT, true);
    fdfSetTitle(CQORV_RUN_TITLE);
    int aStatus = 0;
    try {
        aStatus = runChain(theCommandLine, theTable, aStart);
    } catch (...) {
        const std::string aTitle = fdfGetTitle();
        QORV_FATAL(CQORV_ERR_CATCH_ALL, aTitle.c_str());
    }
    fdfCloseAll(aStatus, true, true);
    return aStatus;
}
