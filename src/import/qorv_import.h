// One import: a native archive in, raw products out. Recognition and headers, the outside orbit,
// the scan of every record's codes, the line plan (and the cut of --lines), the description of
// each product and, last, the writing of each; a failure anywhere leaves no product of the failed
// import that looks complete.
#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "qorv_product_description.h"

struct CImportRequest {
    std::filesystem::path mInput;          // a CEOS product directory, its data or leader file, an .E1/.E2 file
    std::filesystem::path mOutDir = ".";
    std::filesystem::path mOrbitFile;      // an outside orbit replacing the archive's; empty: none
    std::filesystem::path mAuxFile;        // an outside instrument file; the ERS formats need none
    int64_t mFirstRecord = 0;              // --lines FIRST:COUNT, records of the data file from 0
    int64_t mRecordCount = -1;             // -1: to the end
    bool mWrite = true;                    // false: name and describe the products, write nothing
    /// Progress: the stage's words and its percentage.
    std::function<void(const std::string& theStage, int thePercent)> mProgress;
};

struct CImportedProduct {
    std::string mName;                     // NAME: sensor, date and time of the first pulse, orbit, polarisation
    std::filesystem::path mInput;          // the input that holds this product's records alone (an ALOS
                                           // image file when the input held several, else the input)
    std::filesystem::path mRaster;         // OUT/NAME_raw (written only when asked)
    std::filesystem::path mHeader;         // OUT/NAME_raw.sml
    int64_t mLines = 0;                    // records of the product, fill lines included
    int64_t mFillLines = 0;
    int64_t mPulses = 0;
    int64_t mFirstRecord = 0, mLastRecord = 0;
    int mPriCode = 0;
    std::string mStartTime, mStopTime;     // "DD-MMM-YYYY hh:mm:ss.uuuuuu" of the first and last pulse
    std::string mTimeSource;
    CProductDescription mDescription;
    std::vector<std::string> mNotes;
};

struct CImportReport {
    std::filesystem::path mSource;
    std::string mFormat, mSensor, mLayout, mFacility, mProcessor, mProductName;
    int mOrbit = -1;
    uint64_t mRecords = 0, mDeclaredRecords = 0;   // of every data file read (ALOS: every image file)
    int mSamples = 0;
    std::vector<std::string> mNotes;
    std::vector<std::pair<int, std::string>> mWarnings;   // warning id, words
    std::vector<CImportedProduct> mProducts;
};

/// Imports theRequest's input; throws CImportFailure (the ids of docs/importers.md).
CImportReport fqorvImport(const CImportRequest& theRequest);

/// NAME of a product: "ERS2_20020615_174928" (sensor: ERS1, ERS2, ASAR or PALSAR; date and time of
/// the first pulse to the second), with "_o<orbit>" when the archive gives its orbit and
/// "_<polarisation>" when given (ASAR and ALOS: "PALSAR_20070312_101530_HV").
std::string fqorvProductName(const std::string& theSensor, long theDay, double theSeconds, int theOrbit,
                             const std::string& thePolarisation = {});
