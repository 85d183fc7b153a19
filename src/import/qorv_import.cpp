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
// Stage 1: the archive, and the outside files it may take

CNativeArchive readArchive(const CImportRequest& r, std::vector<CStateVector>& theOutsideOrbit)
{
    progress(r, "reading the headers", 0);
    CNativeArchive a = fqorvReadNativeArchive(r.mInput);
    if (!r.mAuxFile.empty())
        fqorvImportFail(CQORV_ERR_IMPORT_OPTION, a.mFormat + " needs no auxiliary file: leave out --aux " + r.mAuxFile.string());
    if (!r.mOrbitFile.empty()) theOutsideOrbit = fqorvReadOrbitFile(r.mOrbitFile, a.mReferenceDay);
    return a;
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

std::vector<CImportedProduct> describeProducts(const CImportRequest& r, const CNativeArchive& a, const CLinePlan& thePlan,
                                               const std::vector<CStateVector>& theOutsideOrbit)
{
    std::vector<CImportedProduct> aProducts;
    std::set<std::string> aNames;
    for (const CPlannedProduct& p : thePlan.mProducts) {
        CImportedProduct x;
        x.mDescription = fqorvDescribeProduct(a, p, theOutsideOrbit, r.mOrbitFile.string());
        const CProductDescription& d = x.mDescription;
        x.mName = fqorvProductName(a.mSensor, a.mReferenceDay, d.mStartTime, a.mOrbit);
        // Two products of one file that begin within the same second keep apart.
        for (int k = 2; aNames.count(x.mName) > 0; ++k) x.mName = fqorvProductName(a.mSensor, a.mReferenceDay, d.mStartTime, a.mOrbit) + "_" + std::to_string(k);
        aNames.insert(x.mName);
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
        aProducts.push_back(std::move(x));
    }
    return aProducts;
}

}  // namespace

std::string fqorvProductName(const std::string& theSensor, long theDay, double theSeconds, int theOrbit)
{
    CQorvDate d;
    d.set(theDay, std::floor(theSeconds));
    const long s = std::lround(d.mSeconds);
    char aName[96];
    std::string aSensor;
    for (char c : theSensor)
        if (c != '-' && c != '_') aSensor += c;
    std::snprintf(aName, sizeof aName, "%s_%04d%02d%02d_%02ld%02ld%02ld", aSensor.c_str(), d.mYear, d.mMonth, d.mDay, s / 3600,
                  s / 60 % 60, s % 60);
    std::string n = aName;
    if (theOrbit >= 0) n += "_o" + std::to_string(theOrbit);
    return n;
}

CImportReport fqorvImport(const CImportRequest& theRequest)
{
    std::vector<CStateVector> aOutsideOrbit;
    const CNativeArchive a = readArchive(theRequest, aOutsideOrbit);
    CImportReport aReport;
    aReport.mSource = theRequest.mInput;
    aReport.mFormat = a.mFormat;
    aReport.mSensor = a.mSensor;
    aReport.mLayout = a.mLayoutName;
    aReport.mFacility = a.mFacility;
    aReport.mProcessor = a.mProcessor;
    aReport.mProductName = a.mProductName;
    aReport.mOrbit = a.mOrbit;
    aReport.mRecords = a.mLayout.mRecords;
    aReport.mDeclaredRecords = a.mLayout.mDeclaredRecords;
    aReport.mSamples = a.mLayout.mSamples;
    aReport.mNotes = a.mNotes;
    if (a.mTruncated)
        aReport.mWarnings.emplace_back(CQORV_WARN_IMPORT_TRUNCATED, std::to_string(a.mLayout.mRecords) + " whole lines of the " +
                                                                        std::to_string(a.mLayout.mDeclaredRecords) + " declared");

    const CLinePlan aPlan = planLines(theRequest, a);
    aReport.mNotes.insert(aReport.mNotes.end(), aPlan.mNotes.begin(), aPlan.mNotes.end());
    for (const std::string& w : aPlan.mWarnings) aReport.mWarnings.emplace_back(CQORV_WARN_IMPORT_CLOCK, w);
    aReport.mProducts = describeProducts(theRequest, a, aPlan, aOutsideOrbit);
    for (const CImportedProduct& x : aReport.mProducts)
        for (const auto& w : x.mDescription.mWarnings) aReport.mWarnings.push_back(w);
    if (!theRequest.mWrite) return aReport;

    // Stage 4: the products, one after the other.
    std::error_code e;
    fs::create_directories(theRequest.mOutDir, e);
    if (!fs::is_directory(theRequest.mOutDir, e))
        fqorvImportFail(CQORV_ERR_CREATE_FILE, "the output directory " + theRequest.mOutDir.string() + " cannot be made");
    CNativeRecordFile aRecords(a.mLayout);
    for (std::size_t i = 0; i < aReport.mProducts.size(); ++i) {
        const CImportedProduct& x = aReport.mProducts[i];
        fqorvWriteRawProduct(a, aRecords, aPlan.mProducts[i], x.mDescription, x.mRaster,
                             [&](int p) { progress(theRequest, "writing " + x.mName, p); });
    }
    return aReport;
}
