#include "qorv_import.h"

#include <cmath>
#include <cstdio>
#include <set>

#include "qorv_date.h"
#include "qorv_import_failure.h"
#include "qorv_line_plan.h"
#include "qorv_native_reader.h"
#include "qorv_orbit_file.h"
#include "qorv_raw_product_writer.h"

namespace {

namespace fs = std::filesystem;

std::string dateText(long theDay, double theSeconds)
{
    CQorvDate d;
    d.set(theDay, theSeconds);
    return d.text();
}

void progress(const CImportRequest& r, const std::string& theStage, int thePercent)
{
    if (r.mProgress) r.mProgress(theStage, thePercent);
}

// ------------------------------------------------------------------------------------------------
// Stage 1: the archives (one per ALOS image file, else one), and the outside files they take

struct CArchiveImport {
    CNativeArchive mArchive;
    std::vector<CStateVector> mOutsideOrbit;   // replaces the archive's vectors when given
    CLinePlan mPlan;
};

std::vector<CArchiveImport> readArchives(const CImportRequest& r)
{
    progress(r, "reading the headers", 0);
    std::vector<CArchiveImport> aImports;
    for (CNativeArchive& a : fqorvReadNativeArchives(r.mInput, CNativeOutsideFiles{r.mAuxFile, r.mOrbitFile})) {
        if (!r.mAuxFile.empty() && a.mFamily != ENativeFamily::Asar)
            fqorvImportFail(CQORV_ERR_IMPORT_OPTION, a.mFormat + " needs no auxiliary file: leave out --aux " + r.mAuxFile.string());
        CArchiveImport x;
        // An ASAR reader takes its orbit file itself (its header holds a single vector).
        if (!r.mOrbitFile.empty() && a.mFamily != ENativeFamily::Asar)
            x.mOutsideOrbit = fqorvReadOrbitFile(r.mOrbitFile, a.mReferenceDay);
        x.mArchive = std::move(a);
        aImports.push_back(std::move(x));
    }
    return aImports;
}

// ------------------------------------------------------------------------------------------------
// Stage 2: the lines

CLinePlan planLines(const CImportRequest& r, const CNativeArchive& a)
{
    CNativeRecordFile aRecords(a.mLayout);
    const std::vector<CRecordCodes> aCodes = aRecords.scan([&](int p) { progress(r, "scanning the lines", p); });
    CLinePlan aPlan = fqorvPlanLines(aCodes, a);
    if (r.mFirstRecord != 0 || r.mRecordCount >= 0) {
        if (r.mFirstRecord < 0 || static_cast<uint64_t>(r.mFirstRecord) >= a.mLayout.mRecords)
            fqorvImportFail(CQORV_ERR_IMPORT_OPTION, "--lines " + std::to_string(r.mFirstRecord) + ":" +
                                                         std::to_string(r.mRecordCount) + " begins beyond the " +
                                                         std::to_string(a.mLayout.mRecords) + " lines of the data file");
        aPlan = fqorvCutPlan(aPlan, r.mFirstRecord, r.mRecordCount < 0 ? static_cast<int64_t>(a.mLayout.mRecords) : r.mRecordCount);
    }
    return aPlan;
}

// ------------------------------------------------------------------------------------------------
// Stage 3: each product described and named; nothing is written before all are

void describeProducts(const CImportRequest& r, const CArchiveImport& theImport, bool theSeveral,
                      std::set<std::string>& theNames, std::vector<CImportedProduct>& theProducts)
{
    const CNativeArchive& a = theImport.mArchive;
    // The polarisation names the products of sensors that record more than one.
    const std::string aPolarisation = a.mFamily == ENativeFamily::Ers ? std::string() : a.mPolarisation;
    for (const CPlannedProduct& p : theImport.mPlan.mProducts) {
        CImportedProduct x;
        x.mDescription = fqorvDescribeProduct(a, p, theImport.mOutsideOrbit, r.mOrbitFile.string());
        const CProductDescription& d = x.mDescription;
        const std::string aName = fqorvProductName(a.mSensor, a.mReferenceDay, d.mStartTime, a.mOrbit, aPolarisation);
        x.mName = aName;
        // Two products of one file that begin within the same second keep apart.
        for (int k = 2; theNames.count(x.mName) > 0; ++k) x.mName = aName + "_" + std::to_string(k);
        theNames.insert(x.mName);
        x.mInput = theSeveral ? a.mLayout.mDataFile : r.mInput;
        x.mRaster = r.mOutDir / (x.mName + "_raw");
        x.mHeader = r.mOutDir / (x.mName + "_raw.sml");
        x.mLines = static_cast<int64_t>(p.mLines.size());
        for (const CPlannedLine& l : p.mLines) x.mFillLines += l.mSource < 0 ? 1 : 0;
        x.mPulses = p.mPulses;
        x.mFirstRecord = p.mFirstRecord;
        x.mLastRecord = p.mLastRecord;
        x.mPriCode = p.mPriCode;
        x.mStartTime = dateText(a.mReferenceDay, d.mStartTime);
        x.mStopTime = dateText(a.mReferenceDay, d.mStopTime);
        x.mTimeSource = p.mTimeSource;
        x.mNotes = p.mNotes;
        x.mNotes.insert(x.mNotes.end(), d.mNotes.begin(), d.mNotes.end());
        theProducts.push_back(std::move(x));
    }
}

}  // namespace

std::string fqorvProductName(const std::string& theSensor, long theDay, double theSeconds, int theOrbit,
                             const std::string& thePolarisation)
{
    CQorvDate d;
    d.set(theDay, std::floor(theSeconds));
    const long s = std::lround(d.mSeconds);
    char aName[96];
    std::string aSensor = theSensor == "ENVISAT-1" ? "ASAR" : theSensor == "ALOS_PALSAR" ? "PALSAR" : "";
    for (char c : aSensor.empty() ? theSensor : std::string())
        if (c != '-' && c != '_') aSensor += c;
    std::snprintf(aName, sizeof aName, "%s_%04d%02d%02d_%02ld%02ld%02ld", aSensor.c_str(), d.mYear, d.mMonth, d.mDay, s / 3600,
                  s / 60 % 60, s % 60);
    std::string n = aName;
    if (theOrbit >= 0) n += "_o" + std::to_string(theOrbit);
    if (!thePolarisation.empty()) n += "_" + thePolarisation;
    return n;
}

CImportReport fqorvImport(const CImportRequest& theRequest)
{
    std::vector<CArchiveImport> aImports = readArchives(theRequest);
    const bool aSeveral = aImports.size() > 1;
    const CNativeArchive& aFirst = aImports.front().mArchive;
    CImportReport aReport;
    aReport.mSource = theRequest.mInput;
    aReport.mFormat = aFirst.mFormat;
    aReport.mSensor = aFirst.mSensor;
    aReport.mLayout = aFirst.mLayoutName;
    aReport.mFacility = aFirst.mFacility;
    aReport.mProcessor = aFirst.mProcessor;
    aReport.mProductName = aFirst.mProductName;
    aReport.mOrbit = aFirst.mOrbit;
    aReport.mSamples = aFirst.mLayout.mSamples;
    std::set<std::string> aNames;
    for (CArchiveImport& x : aImports) {
        const CNativeArchive& a = x.mArchive;
        // With several image files, what is said of one names it.
        const std::string aOf = aSeveral ? a.mLayout.mDataFile.filename().string() + ": " : std::string();
        aReport.mRecords += a.mLayout.mRecords;
        aReport.mDeclaredRecords += a.mLayout.mDeclaredRecords;
        for (const std::string& n : a.mNotes) aReport.mNotes.push_back(aOf + n);
        if (a.mTruncated)
            aReport.mWarnings.emplace_back(CQORV_WARN_IMPORT_TRUNCATED, aOf + std::to_string(a.mLayout.mRecords) + " whole lines of the " +
                                                                            std::to_string(a.mLayout.mDeclaredRecords) + " declared");
        x.mPlan = planLines(theRequest, a);
        for (const std::string& n : x.mPlan.mNotes) aReport.mNotes.push_back(aOf + n);
        for (const std::string& w : x.mPlan.mWarnings) aReport.mWarnings.emplace_back(CQORV_WARN_IMPORT_CLOCK, aOf + w);
        describeProducts(theRequest, x, aSeveral, aNames, aReport.mProducts);
    }
    for (const CImportedProduct& p : aReport.mProducts)
        for (const auto& w : p.mDescription.mWarnings) aReport.mWarnings.push_back(w);
    if (!theRequest.mWrite) return aReport;

    // Stage 4: the products, one after the other.
    std::error_code e;
    fs::create_directories(theRequest.mOutDir, e);
    if (!fs::is_directory(theRequest.mOutDir, e))
        fqorvImportFail(CQORV_ERR_CREATE_FILE, "the output directory " + theRequest.mOutDir.string() + " cannot be made");
    std::size_t aProduct = 0;
    for (const CArchiveImport& x : aImports) {
        CNativeRecordFile aRecords(x.mArchive.mLayout);
        for (const CPlannedProduct& p : x.mPlan.mProducts) {
            const CImportedProduct& r = aReport.mProducts[aProduct++];
            fqorvWriteRawProduct(x.mArchive, aRecords, p, r.mDescription, r.mRaster,
                                 [&](int thePercent) { progress(theRequest, "writing " + r.mName, thePercent); });
        }
    }
    return aReport;
}
