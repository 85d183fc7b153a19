// Recognition of native ERS archives by their content, what the readers of the formats share, and
// the walk over the line records of a data file.
#include "qorv_native_reader.h"

#include <fcntl.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <string>
#include <thread>
#include <vector>

#include "qorv_ceos_records.h"
#include "qorv_envisat_headers.h"
#include "qorv_generic_utility.h"
#include "qorv_import_failure.h"
#include "qorv_native_formats.h"

namespace fs = std::filesystem;

// ---------------------------------------------------------------------------------------------
// Shared by the readers

bool fqorvReadAt(int theFd, uint64_t theOffset, void* theBuffer, std::size_t theCount)
{
    auto* aBytes = static_cast<uint8_t*>(theBuffer);
    while (theCount > 0) {
        const ssize_t aRead = ::pread(theFd, aBytes, theCount, static_cast<off_t>(theOffset));
        if (aRead < 0 && errno == EINTR) continue;
        if (aRead <= 0) {
            if (aRead == 0) errno = 0;
            return false;
        }
        aBytes += aRead;
        theOffset += static_cast<uint64_t>(aRead);
        theCount -= static_cast<std::size_t>(aRead);
    }
    return true;
}

std::vector<uint8_t> fqorvReadFileBytes(const fs::path& theFile, uint64_t theOffset, std::size_t theCount)
{
    const int aFd = ::open(theFile.c_str(), O_RDONLY | O_CLOEXEC);
    if (aFd < 0) fqorvImportFail(CQORV_ERR_MISSING_FILE, theFile.string() + ": " + std::strerror(errno));
    std::vector<uint8_t> aBytes(theCount);
    std::size_t aDone = 0;
    while (aDone < theCount) {
        const ssize_t aRead = ::pread(aFd, aBytes.data() + aDone, theCount - aDone, static_cast<off_t>(theOffset + aDone));
        if (aRead < 0 && errno == EINTR) continue;
        if (aRead < 0) {
            const std::string aWhy = std::strerror(errno);
            ::close(aFd);
            fqorvImportFail(CQORV_ERR_RASTER_READ, theFile.string() + ": " + aWhy);
        }
        if (aRead == 0) break;
        aDone += static_cast<std::size_t>(aRead);
    }
    ::close(aFd);
    aBytes.resize(aDone);
    return aBytes;
}

std::string fqorvErsMission(const std::string& theMission)
{
    std::string aKey;
    for (const char c : theMission)
        if (c != '-' && c != '_' && c != ' ') aKey += static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
    if (aKey == "E1" || aKey.rfind("ERS1", 0) == 0) return "ERS-1";
    if (aKey == "E2" || aKey.rfind("ERS2", 0) == 0) return "ERS-2";
    return "";
}

void fqorvRefuseOtherMission(const std::string& theMission, int theId, const std::string& theWords)
{
    if (!fqorvErsMission(theMission).empty()) return;
    fqorvImportFail(theId, theWords);
}

void fqorvSetErsAuxPositions(CNativeRecordLayout& theLayout, int theCounterPos)
{
    theLayout.mCounterPos = theCounterPos;
    theLayout.mClockPos = theCounterPos - 6;
    theLayout.mSwstPos = theCounterPos + 4;
    theLayout.mPriPos = theCounterPos + 6;
    theLayout.mMarkerPos = theCounterPos - 8;
    theLayout.mAuxPos = theCounterPos - 18;
}

namespace {

/// The record's own length as its length field states it.
uint32_t statedLength(const CNativeRecordLayout& theLayout, const uint8_t* theRecord)
{
    const uint8_t* aField = theRecord + theLayout.mLengthPos;
    const uint32_t aValue = theLayout.mLengthBytes == 2 ? fqorvBigEndianU16(aField) : fqorvBigEndianU32(aField);
    return aValue + static_cast<uint32_t>(theLayout.mLengthAdd);
}

/// Bytes from a record's start that hold its length field and its codes (ERS: the auxiliary block).
uint32_t codeSpan(const CNativeRecordLayout& theLayout)
{
    if (theLayout.mFamily == ENativeFamily::Alos) return CQORV_ALOS_CODE_SPAN;
    const int aEnd = std::max({theLayout.mLengthPos + theLayout.mLengthBytes, theLayout.mAuxPos + 26,
                               theLayout.mCounterPos + 4, theLayout.mClockPos + 4, theLayout.mSwstPos + 2,
                               theLayout.mPriPos + 2, theLayout.mMarkerPos + 1});
    return static_cast<uint32_t>(aEnd);
}

/// The codes of a record from its first codeSpan() bytes; ALOS times count from theReferenceDay.
CRecordCodes codesOf(const CNativeRecordLayout& theLayout, const uint8_t* theRecord, long theReferenceDay = 0)
{
    if (theLayout.mFamily == ENativeFamily::Alos) return fqorvAlosRecordCodes(theRecord, theReferenceDay);
    CRecordCodes aCodes;
    aCodes.mCounter = fqorvBigEndianU32(theRecord + theLayout.mCounterPos);
    aCodes.mClock = fqorvBigEndianU32(theRecord + theLayout.mClockPos);
    aCodes.mSwst = fqorvBigEndianU16(theRecord + theLayout.mSwstPos);
    aCodes.mPri = fqorvBigEndianU16(theRecord + theLayout.mPriPos);
    aCodes.mMarker = theRecord[theLayout.mMarkerPos] == NQORV_ERS::MARKER;
    return aCodes;
}

[[noreturn]] void failRecordLength(const CNativeRecordLayout& theLayout, uint64_t theIndex, uint32_t theStated)
{
    fqorvImportFail(CQORV_ERR_IMPORT_RECORD_LENGTH,
                    theLayout.mDataFile.filename().string() + ": record " + std::to_string(theIndex + 1) + " at byte " +
                        std::to_string(theLayout.mFirstRecord + theIndex * theLayout.mRecordLength) + " states a length of " +
                        std::to_string(theStated) + " bytes, the descriptor " + std::to_string(theLayout.mRecordLength));
}

}  // namespace

void fqorvCheckFirstRecords(const CNativeRecordLayout& theLayout, const std::string& theVariant)
{
    const std::size_t aCount = static_cast<std::size_t>(std::min<uint64_t>(theLayout.mRecords, 16));
    std::vector<uint8_t> aRecords(aCount * theLayout.mRecordLength);
    CNativeRecordFile aFile(theLayout);
    aFile.read(0, aCount, aRecords.data());
    const uint32_t aStated = statedLength(theLayout, aRecords.data());
    if (aStated != theLayout.mRecordLength) failRecordLength(theLayout, 0, aStated);
    std::size_t aMarked = 0;
    for (std::size_t i = 0; i < aCount; ++i)
        if (aRecords[i * theLayout.mRecordLength + static_cast<std::size_t>(theLayout.mMarkerPos)] == NQORV_ERS::MARKER) ++aMarked;
    if (2 * aMarked < aCount)
        fqorvImportFail(CQORV_ERR_IMPORT_LAYOUT, theLayout.mDataFile.filename().string() + ": the 0xAA marker at byte " +
                                                     std::to_string(theLayout.mMarkerPos) + " is missing in " +
                                                     std::to_string(aCount - aMarked) + " of the first " + std::to_string(aCount) +
                                                     " records: not the layout " + theVariant);
}

void fqorvCountRecords(CNativeArchive& theArchive)
{
    CNativeRecordLayout& aLayout = theArchive.mLayout;
    std::error_code aError;
    const uint64_t aSize = fs::file_size(aLayout.mDataFile, aError);
    if (aError) fqorvImportFail(CQORV_ERR_RASTER_READ, aLayout.mDataFile.string() + ": " + aError.message());
    const uint64_t aWhole = aSize > aLayout.mFirstRecord ? (aSize - aLayout.mFirstRecord) / aLayout.mRecordLength : 0;
    const std::string aName = aLayout.mDataFile.filename().string();
    if (aWhole == 0)
        fqorvImportFail(CQORV_ERR_IMPORT_NO_LINES, aName + ": " + std::to_string(aSize) + " bytes hold no whole record of " +
                                                       std::to_string(aLayout.mRecordLength) + " bytes after the first " +
                                                       std::to_string(aLayout.mFirstRecord));
    const uint64_t aDeclared = aLayout.mDeclaredRecords;
    aLayout.mRecords = aWhole;
    if (aDeclared == 0) {
        theArchive.mNotes.push_back(aName + " declares no line count: its " + std::to_string(aWhole) + " whole records are taken");
    } else if (aWhole < aDeclared) {
        theArchive.mTruncated = true;
        theArchive.mNotes.push_back(aName + " is truncated: " + std::to_string(aWhole) + " of " + std::to_string(aDeclared) +
                                    " declared lines");
    } else if (aWhole > aDeclared) {
        aLayout.mRecords = aDeclared;
        theArchive.mNotes.push_back(aName + " holds " + std::to_string(aWhole - aDeclared) + " whole records beyond the " +
                                    std::to_string(aDeclared) + " declared lines: left out");
    }
}

void fqorvCheckStatedValues(const CNativeArchive& theArchive)
{
    const std::string aSource =
        theArchive.mFiles.empty() ? theArchive.mSource.string() : theArchive.mFiles.front().filename().string();
    const auto check = [&](double theValue, double theLow, double theHigh, const char* theWhat, const char* theUnit) {
        if (std::isnan(theValue) || (theValue > theLow && theValue < theHigh)) return;
        char aText[64];
        std::snprintf(aText, sizeof aText, "%.9g %s", theValue, theUnit);
        fqorvImportFail(CQORV_ERR_IMPORT_VALUE, aSource + " states " + theWhat + " of " + aText);
    };
    check(theArchive.mWavelength, 0.005, 1.0, "a wavelength", "m");
    check(theArchive.mSamplingRate, 1.0e6, 1.0e9, "a sampling rate", "Hz");
    check(theArchive.mPulseLength, 1.0e-7, 1.0e-3, "a pulse length", "s");
    check(theArchive.mPrf, 100.0, 1.0e5, "a PRF", "Hz");
    check(std::fabs(theArchive.mChirpRate), 1.0e8, 1.0e15, "a chirp rate (magnitude)", "Hz/s");
}

// ---------------------------------------------------------------------------------------------
// Recognition

namespace {

/// Bytes of a signal record's start that tell an ALOS image file.
constexpr std::size_t CQORV_ALOS_SIGNAL_HEAD = 60;

/// An ALOS signal record states binary values that ERS records do not hold at these places: its
/// data and right-fill pixels (24, 28) fill its length after a 412-byte prefix, and its year (36),
/// day of the year (40), millisecond of the day (44) and PRF in mHz (56) are those of a line. ERS
/// records hold blanks, zeros or a pixel count without a date there.
bool isAlosSignalRecord(const std::vector<uint8_t>& theHead)
{
    if (theHead.size() < CQORV_ALOS_SIGNAL_HEAD) return false;
    const auto u32 = [&](std::size_t thePos) { return static_cast<uint64_t>(fqorvBigEndianU32(theHead.data() + thePos)); };
    const uint64_t aYear = u32(36), aDay = u32(40), aMs = u32(44), aPrf = u32(56);
    return 412 + 2 * (u32(24) + u32(28)) == u32(8) && u32(24) > 0 && aYear >= 1990 && aYear <= 2100 && aDay >= 1 &&
           aDay <= 366 && aMs < 86400000 && aPrf >= 100000 && aPrf <= 100000000;
}

bool isAlos(const CNativeFileClass& theClass) { return theClass.mMission.rfind("ALOS", 0) == 0; }

}  // namespace

CNativeFileClass fqorvClassifyNativeFile(const fs::path& theFile)
{
    CNativeFileClass aClass;
    std::error_code aError;
    const uint64_t aSize = fs::file_size(theFile, aError);
    const std::vector<uint8_t> aHead = aError ? std::vector<uint8_t>{} : fqorvReadFileBytes(theFile, 0, 16);
    if (aHead.size() >= 8 && std::memcmp(aHead.data(), "PRODUCT=", 8) == 0) {
        aClass.mKind = ENativeFileKind::Envisat;
        aClass.mWhat = "an ENVISAT-format product";
        return aClass;
    }
    if (aHead.size() < CQORV_CEOS_HEADER_BYTES) {
        aClass.mWhat = "a file of " + std::to_string(aHead.size()) + " bytes";
        return aClass;
    }
    const CCeosRecord aFirst = fqorvCeosRecordHeader(aHead.data(), 0);
    if (aFirst.mSequence != 1 || aFirst.mLength < CQORV_CEOS_HEADER_BYTES || aFirst.mLength > aSize) {
        char aBytes[64];
        std::snprintf(aBytes, sizeof aBytes, "%02x %02x %02x %02x %02x %02x %02x %02x", aHead[0], aHead[1], aHead[2], aHead[3],
                      aHead[4], aHead[5], aHead[6], aHead[7]);
        aClass.mWhat = "neither CEOS records nor an ENVISAT-format product (it begins with the bytes " + std::string(aBytes) + ")";
        return aClass;
    }

    // A data file: its descriptor is followed by signal data records (kind 50).
    const std::vector<uint8_t> aSecond = fqorvReadFileBytes(theFile, aFirst.mLength, CQORV_ALOS_SIGNAL_HEAD);
    if (aSecond.size() >= CQORV_CEOS_HEADER_BYTES) {
        const CCeosRecord aRecord = fqorvCeosRecordHeader(aSecond.data(), aFirst.mLength);
        if (aRecord.mSequence == 2 && aRecord.mType[0] == 50) {
            aClass.mKind = ENativeFileKind::CeosData;
            aClass.mWhat = "a CEOS data file";
            if (isAlosSignalRecord(aSecond)) {
                aClass.mMission = "ALOS";
                aClass.mWhat = "an ALOS PALSAR image file";
            }
            return aClass;
        }
    }
    // A leader: a data set summary among its first records.
    aClass.mKind = ENativeFileKind::CeosOther;
    aClass.mWhat = "a CEOS file that is neither a leader nor a data file (first record of types " + aFirst.typeText() + ")";
    // The walk may stop at a broken record: the records before it tell the kind, reading tells the rest.
    std::string aStop;
    const std::vector<CCeosRecord> aRecords = fqorvWalkCeosFile(theFile, 16, &aStop);
    if (const CCeosRecord* aSummary = fqorvFindCeosRecord(aRecords, 10, 10)) {
        aClass.mKind = ENativeFileKind::CeosLeader;
        const CCeosFields aFields = fqorvReadCeosRecord(theFile, *aSummary, "data set summary");
        aClass.mMission = aFields.length() >= 412 ? aFields.text(396, 16) : "";
        aClass.mWhat = "a CEOS leader of the mission '" + aClass.mMission + "'";
    } else if (!aStop.empty()) {
        aClass.mWhat = "a CEOS file whose records can't be walked (" + aStop + ")";
    }
    return aClass;
}

namespace {

/// Refuses a CEOS leader given (or alone in a directory) of another mission than ERS or ALOS.
void refuseOtherMission(const CNativeFileClass& theLeader, const fs::path& theFile)
{
    fqorvRefuseOtherMission(theLeader.mMission, CQORV_ERR_IMPORT_UNKNOWN_INPUT,
                            theFile.string() + " is a CEOS leader of the mission '" + theLeader.mMission +
                                "': only ERS-1/2 and ALOS PALSAR CEOS products are imported");
}

struct CClassifiedFile {
    fs::path mPath;
    CNativeFileClass mClass;
};

/// The regular files of theDirectory but theExcept, classified by content; unreadable ones are left out.
std::vector<CClassifiedFile> classifyDirectory(const fs::path& theDirectory, const fs::path& theExcept = {})
{
    std::vector<CClassifiedFile> aFiles;
    std::error_code aError;
    for (const fs::directory_entry& aEntry : fs::directory_iterator(theDirectory, aError)) {
        if (!aEntry.is_regular_file(aError) || (!theExcept.empty() && fs::equivalent(aEntry.path(), theExcept, aError))) continue;
        try {
            aFiles.push_back({aEntry.path(), fqorvClassifyNativeFile(aEntry.path())});
        } catch (const CImportFailure&) {
        }
    }
    std::sort(aFiles.begin(), aFiles.end(), [](const CClassifiedFile& a, const CClassifiedFile& b) { return a.mPath < b.mPath; });
    return aFiles;
}

std::vector<const CClassifiedFile*> ofKind(const std::vector<CClassifiedFile>& theFiles, ENativeFileKind theKind)
{
    std::vector<const CClassifiedFile*> aFound;
    for (const CClassifiedFile& aFile : theFiles)
        if (aFile.mClass.mKind == theKind) aFound.push_back(&aFile);
    return aFound;
}

/// The ALOS files of theFiles (theAlos), or the others.
std::vector<const CClassifiedFile*> ofAlos(std::vector<const CClassifiedFile*> theFiles, bool theAlos)
{
    std::erase_if(theFiles, [theAlos](const CClassifiedFile* theFile) { return isAlos(theFile->mClass) != theAlos; });
    return theFiles;
}

std::string namesOf(const std::vector<const CClassifiedFile*>& theFiles)
{
    std::string aNames;
    for (const CClassifiedFile* aFile : theFiles) aNames += (aNames.empty() ? "" : ", ") + aFile->mPath.filename().string();
    return aNames;
}

/// The ERS leader among theCandidates for theData; anything else is 979202.
fs::path leaderFor(const fs::path& theData, const std::vector<CClassifiedFile>& theCandidates)
{
    const std::vector<const CClassifiedFile*> aLeaders = ofKind(theCandidates, ENativeFileKind::CeosLeader);
    std::vector<const CClassifiedFile*> aErs;
    for (const CClassifiedFile* aLeader : aLeaders)
        if (!fqorvErsMission(aLeader->mClass.mMission).empty()) aErs.push_back(aLeader);
    if (aErs.size() == 1) return aErs.front()->mPath;
    if (aErs.size() > 1)
        fqorvImportFail(CQORV_ERR_IMPORT_LEADER, "several ERS leaders beside " + theData.string() + ": " + namesOf(aErs));
    for (const CClassifiedFile* aLeader : aLeaders)
        fqorvRefuseOtherMission(aLeader->mClass.mMission, CQORV_ERR_IMPORT_LEADER,
                                "no ERS leader beside " + theData.string() + ": " + aLeader->mPath.filename().string() +
                                    " is " + aLeader->mClass.mWhat);
    const std::vector<const CClassifiedFile*> aOthers = ofKind(theCandidates, ENativeFileKind::CeosOther);
    fqorvImportFail(CQORV_ERR_IMPORT_LEADER, "no CEOS leader beside " + theData.string() +
                                                 (aOthers.empty() ? std::string() : " (other CEOS files: " + namesOf(aOthers) + ")"));
}

/// The one ERS CEOS data file among theCandidates (261122 when there is none).
fs::path dataFileAmong(const std::vector<CClassifiedFile>& theCandidates, const std::string& theWhere)
{
    const std::vector<const CClassifiedFile*> aData = ofAlos(ofKind(theCandidates, ENativeFileKind::CeosData), false);
    if (aData.empty()) fqorvImportFail(CQORV_ERR_MISSING_FILE, "no CEOS data file " + theWhere);
    if (aData.size() > 1)
        fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT, "several CEOS data files " + theWhere + ": " + namesOf(aData) + "; name one");
    return aData.front()->mPath;
}

fs::path directoryOf(const fs::path& theFile)
{
    return theFile.has_parent_path() ? theFile.parent_path() : fs::path(".");
}

// ---- ALOS: one leader, one image file per polarisation ----------------------------------------

/// The scene identity of an ALOS file name: what follows "LED-" or "IMG-XX-"; "" for other names.
std::string alosSceneOf(const fs::path& theFile)
{
    const std::string aName = theFile.filename().string();
    if (aName.rfind("LED-", 0) == 0) return aName.substr(4);
    if (aName.rfind("IMG-", 0) == 0 && aName.size() > 7 && aName[6] == '-') return aName.substr(7);
    return "";
}

struct CAlosFiles {
    fs::path mLeader;                 // empty: not an ALOS product
    std::vector<fs::path> mImages;    // in the order of their names (IMG-HH, IMG-HV, IMG-VH, IMG-VV)
};

/// The ALOS leader beside theImage among theCandidates: the only one, or the one of the image's
/// scene; 979202 when there is none.
fs::path alosLeaderFor(const fs::path& theImage, const std::vector<CClassifiedFile>& theCandidates)
{
    const std::vector<const CClassifiedFile*> aLeaders = ofAlos(ofKind(theCandidates, ENativeFileKind::CeosLeader), true);
    if (aLeaders.size() == 1) return aLeaders.front()->mPath;
    if (aLeaders.empty()) fqorvImportFail(CQORV_ERR_IMPORT_LEADER, "no ALOS leader beside " + theImage.string());
    for (const CClassifiedFile* aLeader : aLeaders)
        if (!alosSceneOf(theImage).empty() && alosSceneOf(aLeader->mPath) == alosSceneOf(theImage)) return aLeader->mPath;
    fqorvImportFail(CQORV_ERR_IMPORT_LEADER, "several ALOS leaders beside " + theImage.string() + ": " + namesOf(aLeaders));
}

/// The ALOS image files of theLeader among theCandidates: those of its scene when the names tell
/// it, else all; 261122 when there is none.
std::vector<fs::path> alosImagesOf(const fs::path& theLeader, const std::vector<CClassifiedFile>& theCandidates)
{
    const std::vector<const CClassifiedFile*> aAll = ofAlos(ofKind(theCandidates, ENativeFileKind::CeosData), true);
    std::vector<fs::path> aImages, aOfScene;
    for (const CClassifiedFile* aImage : aAll) {
        aImages.push_back(aImage->mPath);
        if (!alosSceneOf(theLeader).empty() && alosSceneOf(aImage->mPath) == alosSceneOf(theLeader)) aOfScene.push_back(aImage->mPath);
    }
    if (aImages.empty()) fqorvImportFail(CQORV_ERR_MISSING_FILE, "no ALOS image file beside " + theLeader.string());
    return aOfScene.empty() ? aImages : aOfScene;
}

/// A directory is an ALOS product when it holds an ALOS leader or image file and no ERS data file.
bool isAlosDirectory(const std::vector<CClassifiedFile>& theFiles)
{
    const std::vector<const CClassifiedFile*> aData = ofKind(theFiles, ENativeFileKind::CeosData);
    const bool aAlos = !ofAlos(aData, true).empty() || !ofAlos(ofKind(theFiles, ENativeFileKind::CeosLeader), true).empty();
    return aAlos && ofAlos(aData, false).empty();
}

CAlosFiles alosFilesOfDirectory(const fs::path& theDirectory, const std::vector<CClassifiedFile>& theFiles)
{
    const std::vector<const CClassifiedFile*> aLeaders = ofAlos(ofKind(theFiles, ENativeFileKind::CeosLeader), true);
    if (aLeaders.empty()) {
        const std::vector<const CClassifiedFile*> aImages = ofAlos(ofKind(theFiles, ENativeFileKind::CeosData), true);
        fqorvImportFail(CQORV_ERR_IMPORT_LEADER, "no ALOS leader beside " + aImages.front()->mPath.string());
    }
    if (aLeaders.size() > 1)
        fqorvImportFail(CQORV_ERR_IMPORT_LEADER, "several ALOS leaders in " + theDirectory.string() + ": " + namesOf(aLeaders) +
                                                     "; name a leader or an image file");
    return {aLeaders.front()->mPath, alosImagesOf(aLeaders.front()->mPath, theFiles)};
}

/// The ALOS product theInput names (a directory, a leader or an image file); an empty leader when
/// it is none.
CAlosFiles alosFilesOf(const fs::path& theInput)
{
    std::error_code aError;
    if (fs::is_directory(theInput, aError)) {
        const std::vector<CClassifiedFile> aFiles = classifyDirectory(theInput);
        return isAlosDirectory(aFiles) ? alosFilesOfDirectory(theInput, aFiles) : CAlosFiles{};
    }
    const CNativeFileClass aClass = fqorvClassifyNativeFile(theInput);
    if (!isAlos(aClass)) return {};
    const std::vector<CClassifiedFile> aBeside = classifyDirectory(directoryOf(theInput), theInput);
    if (aClass.mKind == ENativeFileKind::CeosLeader) return {theInput, alosImagesOf(theInput, aBeside)};
    return {alosLeaderFor(theInput, aBeside), {theInput}};
}

/// The one product of an ALOS input; an input of several polarisations is 979201.
CNativeArchive readOneAlos(const CAlosFiles& theFiles, const fs::path& theInput)
{
    if (theFiles.mImages.size() > 1) {
        std::string aNames;
        for (const fs::path& aImage : theFiles.mImages) aNames += (aNames.empty() ? "" : ", ") + aImage.filename().string();
        fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT, theInput.string() + " holds the ALOS image files " + aNames +
                                                            ", one product each: name one image file");
    }
    return fqorvReadAlosCeos(theFiles.mLeader, theFiles.mImages.front());
}

CNativeArchive readDirectory(const fs::path& theDirectory)
{
    const std::vector<CClassifiedFile> aFiles = classifyDirectory(theDirectory);
    if (isAlosDirectory(aFiles)) return readOneAlos(alosFilesOfDirectory(theDirectory, aFiles), theDirectory);
    const std::vector<const CClassifiedFile*> aLeaders = ofKind(aFiles, ENativeFileKind::CeosLeader);
    const bool aErsLeader = std::any_of(aLeaders.begin(), aLeaders.end(), [](const CClassifiedFile* theLeader) {
        return !fqorvErsMission(theLeader->mClass.mMission).empty();
    });
    if (!aErsLeader && !aLeaders.empty()) refuseOtherMission(aLeaders.front()->mClass, aLeaders.front()->mPath);
    if (ofKind(aFiles, ENativeFileKind::CeosData).empty()) {
        const std::vector<const CClassifiedFile*> aEnvisat = ofKind(aFiles, ENativeFileKind::Envisat);
        fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT,
                        theDirectory.string() + " holds no CEOS data file (" + std::to_string(aFiles.size()) + " files" +
                            (aEnvisat.empty() ? std::string()
                                              : "; ENVISAT-format products are named one by one: " + namesOf(aEnvisat)) +
                            ")");
    }
    const fs::path aDataFile = dataFileAmong(aFiles, "in " + theDirectory.string());
    return fqorvReadErsCeos(leaderFor(aDataFile, aFiles), aDataFile);
}

/// Polarisations in the order the products of an ALOS input are given.
int polarisationRank(const std::string& thePolarisation)
{
    static const char* const aOrder[] = {"HH", "HV", "VH", "VV"};
    for (int i = 0; i < 4; ++i)
        if (thePolarisation == aOrder[i]) return i;
    return 4;
}

}  // namespace

CNativeArchive fqorvReadNativeArchive(const fs::path& theInput, const CNativeOutsideFiles& theOutside)
{
    std::error_code aError;
    if (!fs::exists(theInput, aError)) fqorvImportFail(CQORV_ERR_MISSING_FILE, theInput.string() + " does not exist");
    CNativeArchive aArchive;
    if (fs::is_directory(theInput, aError)) {
        aArchive = readDirectory(theInput);
    } else {
        const CNativeFileClass aClass = fqorvClassifyNativeFile(theInput);
        switch (aClass.mKind) {
        case ENativeFileKind::Envisat:
            // ASAR image mode level 0 (ASA_IM__0P, and its consolidated form ASA_IM__0C) has packets
            // and outside files of its own; every other product goes to the ERS reader, which
            // refuses what is not ERS level 0.
            if (fqorvEnvisatProductName(theInput).rfind("ASA_IM__0", 0) == 0)
                aArchive = fqorvReadAsarEnvisat(theInput, theOutside);
            else
                aArchive = fqorvReadErsEnvisat(theInput);
            break;
        case ENativeFileKind::CeosLeader: {
            if (isAlos(aClass)) {
                aArchive = readOneAlos({theInput, alosImagesOf(theInput, classifyDirectory(directoryOf(theInput), theInput))}, theInput);
                break;
            }
            refuseOtherMission(aClass, theInput);
            const fs::path aData = dataFileAmong(classifyDirectory(directoryOf(theInput), theInput), "beside " + theInput.string());
            aArchive = fqorvReadErsCeos(theInput, aData);
            break;
        }
        case ENativeFileKind::CeosData:
            if (isAlos(aClass)) {
                aArchive = fqorvReadAlosCeos(alosLeaderFor(theInput, classifyDirectory(directoryOf(theInput), theInput)), theInput);
                break;
            }
            aArchive = fqorvReadErsCeos(leaderFor(theInput, classifyDirectory(directoryOf(theInput), theInput)), theInput);
            break;
        case ENativeFileKind::CeosOther:
        case ENativeFileKind::Other:
            fqorvImportFail(CQORV_ERR_IMPORT_UNKNOWN_INPUT, theInput.string() + " is " + aClass.mWhat);
        }
    }
    aArchive.mSource = theInput;
    return aArchive;
}

std::vector<CNativeArchive> fqorvReadNativeArchives(const fs::path& theInput, const CNativeOutsideFiles& theOutside)
{
    std::error_code aError;
    if (!fs::exists(theInput, aError)) fqorvImportFail(CQORV_ERR_MISSING_FILE, theInput.string() + " does not exist");
    const CAlosFiles aAlos = alosFilesOf(theInput);
    if (aAlos.mLeader.empty()) return {fqorvReadNativeArchive(theInput, theOutside)};
    std::vector<CNativeArchive> aArchives;
    for (const fs::path& aImage : aAlos.mImages) {
        aArchives.push_back(fqorvReadAlosCeos(aAlos.mLeader, aImage));
        aArchives.back().mSource = theInput;
    }
    std::stable_sort(aArchives.begin(), aArchives.end(), [](const CNativeArchive& a, const CNativeArchive& b) {
        return polarisationRank(a.mPolarisation) < polarisationRank(b.mPolarisation);
    });
    return aArchives;
}

// ---------------------------------------------------------------------------------------------
// The line records

CNativeRecordFile::CNativeRecordFile(const CNativeRecordLayout& theLayout) : mLayout(theLayout)
{
    mFd = ::open(mLayout.mDataFile.c_str(), O_RDONLY | O_CLOEXEC);
    if (mFd < 0) fqorvImportFail(CQORV_ERR_MISSING_FILE, mLayout.mDataFile.string() + ": " + std::strerror(errno));
    ::posix_fadvise(mFd, 0, 0, POSIX_FADV_SEQUENTIAL);
}

CNativeRecordFile::~CNativeRecordFile()
{
    if (mFd >= 0) ::close(mFd);
}

std::vector<CRecordCodes> CNativeRecordFile::scan(const std::function<void(int)>& theProgress)
{
    if (mLayout.mFamily == ENativeFamily::Asar) return fqorvScanAsarPackets(mFd, mLayout, theProgress);
    // Records of one length (ERS, ALOS). One read of the bytes that hold the codes per record: the
    // page cache serves them without copying the samples, which make up 96 % of the file. The
    // reads are system calls of a microsecond each, shared by the threads in contiguous parts; a
    // record that fails is reported for the earliest record, whatever the thread count.
    const uint32_t aSpan = codeSpan(mLayout);
    const uint64_t n = mLayout.mRecords;
    std::vector<CRecordCodes> aCodes(n);
    // ALOS records state their date: times count from the first record's day.
    long aReferenceDay = 0;
    if (mLayout.mFamily == ENativeFamily::Alos && n > 0) {
        std::vector<uint8_t> aFirst(aSpan);
        if (fqorvReadAt(mFd, mLayout.mFirstRecord, aFirst.data(), aSpan)) aReferenceDay = fqorvAlosRecordDay(aFirst.data());
    }
    const int aThreads = static_cast<int>(std::clamp<uint64_t>(n / 4096, 1, static_cast<uint64_t>(std::min(fqorvThreadCount(), 4))));
    std::vector<uint64_t> aFailedAt(static_cast<std::size_t>(aThreads), n);
    std::vector<int> aErrno(static_cast<std::size_t>(aThreads), 0);
    auto part = [&](int t) {
        std::vector<uint8_t> aPrefix(aSpan);
        const uint64_t a = n * static_cast<uint64_t>(t) / aThreads, b = n * static_cast<uint64_t>(t + 1) / aThreads;
        int aPercent = -1;
        for (uint64_t i = a; i < b; ++i) {
            if (!fqorvReadAt(mFd, mLayout.mFirstRecord + i * mLayout.mRecordLength, aPrefix.data(), aSpan) ||
                statedLength(mLayout, aPrefix.data()) != mLayout.mRecordLength) {
                aFailedAt[static_cast<std::size_t>(t)] = i;
                aErrno[static_cast<std::size_t>(t)] = errno;
                return;
            }
            aCodes[i] = codesOf(mLayout, aPrefix.data(), aReferenceDay);
            // The first part's progress stands for all: the parts are of one size.
            const int aNow = static_cast<int>((i + 1 - a) * 100 / (b - a));
            if (t == 0 && theProgress && aNow != aPercent) theProgress(aPercent = aNow);
        }
    };
    std::vector<std::thread> aPool;
    for (int t = 1; t < aThreads; ++t) aPool.emplace_back(part, t);
    part(0);
    for (std::thread& x : aPool) x.join();
    for (int t = 0; t < aThreads; ++t) {
        const uint64_t i = aFailedAt[static_cast<std::size_t>(t)];
        if (i == n) continue;
        std::vector<uint8_t> aPrefix(aSpan);
        if (!fqorvReadAt(mFd, mLayout.mFirstRecord + i * mLayout.mRecordLength, aPrefix.data(), aSpan))
            fqorvImportFail(CQORV_ERR_RASTER_READ,
                            mLayout.mDataFile.string() + ": record " + std::to_string(i + 1) + " can't be read" +
                                (aErrno[static_cast<std::size_t>(t)] != 0 ? std::string(": ") + std::strerror(aErrno[static_cast<std::size_t>(t)])
                                                                          : std::string()));
        failRecordLength(mLayout, i, statedLength(mLayout, aPrefix.data()));
    }
    return aCodes;
}

void CNativeRecordFile::read(uint64_t theFirst, std::size_t theCount, uint8_t* theBuffer)
{
    const uint64_t aOffset = mLayout.mFirstRecord + theFirst * mLayout.mRecordLength;
    if (!fqorvReadAt(mFd, aOffset, theBuffer, theCount * mLayout.mRecordLength))
        fqorvImportFail(CQORV_ERR_RASTER_READ, mLayout.mDataFile.string() + ": records " + std::to_string(theFirst + 1) + " to " +
                                                   std::to_string(theFirst + theCount) + " can't be read" +
                                                   (errno != 0 ? std::string(": ") + std::strerror(errno) : std::string()));
}

void CNativeRecordFile::readIntoLines(uint64_t theFirst, std::size_t theCount, uint8_t* theLines, std::size_t theStride,
                                      long theShift)
{
    // Each record is one or three pieces: the bytes before its line's start and beyond its end go
    // to a scratch buffer, the rest into the line; one preadv takes up to 300 records.
    const std::size_t n = mLayout.mRecordLength;
    const std::size_t aBefore = theShift < 0 ? static_cast<std::size_t>(-theShift) : 0;
    const std::size_t aStart = theShift > 0 ? static_cast<std::size_t>(theShift) : 0;
    const std::size_t aInLine = std::min(n - std::min(n, aBefore), theStride - std::min(theStride, aStart));
    const std::size_t aAfter = n - aBefore - aInLine;
    mDropped.resize(std::max<std::size_t>({aBefore, aAfter, 1}));
    constexpr std::size_t CQORV_RECORDS_PER_CALL = 300;
    std::vector<iovec> v;
    for (std::size_t k0 = 0; k0 < theCount; k0 += CQORV_RECORDS_PER_CALL) {
        const std::size_t m = std::min(CQORV_RECORDS_PER_CALL, theCount - k0);
        v.clear();
        for (std::size_t k = k0; k < k0 + m; ++k) {
            if (aBefore > 0) v.push_back({mDropped.data(), aBefore});
            v.push_back({theLines + k * theStride + aStart, aInLine});
            if (aAfter > 0) v.push_back({mDropped.data(), aAfter});
        }
        uint64_t aOffset = mLayout.mFirstRecord + (theFirst + k0) * n;
        std::size_t aLeft = m * n, i = 0;
        while (aLeft > 0) {
            const ssize_t r = ::preadv(mFd, v.data() + i, static_cast<int>(v.size() - i), static_cast<off_t>(aOffset));
            if (r < 0 && errno == EINTR) continue;
            if (r <= 0)
                fqorvImportFail(CQORV_ERR_RASTER_READ, mLayout.mDataFile.string() + ": records " + std::to_string(theFirst + k0 + 1) +
                                                           " to " + std::to_string(theFirst + k0 + m) + " can't be read" +
                                                           (r < 0 ? std::string(": ") + std::strerror(errno) : std::string()));
            aOffset += static_cast<uint64_t>(r);
            aLeft -= static_cast<std::size_t>(r);
            // A short read: skip the pieces filled, shorten the one begun.
            for (std::size_t aDone = static_cast<std::size_t>(r); aDone > 0 && i < v.size();) {
                const std::size_t t = std::min(aDone, v[i].iov_len);
                v[i].iov_base = static_cast<uint8_t*>(v[i].iov_base) + t;
                v[i].iov_len -= t;
                aDone -= t;
                if (v[i].iov_len == 0) ++i;
            }
        }
    }
}

void CNativeRecordFile::readBytes(uint64_t theOffset, std::size_t theCount, uint8_t* theBuffer)
{
    if (!fqorvReadAt(mFd, theOffset, theBuffer, theCount))
        fqorvImportFail(CQORV_ERR_RASTER_READ, mLayout.mDataFile.string() + ": " + std::to_string(theCount) + " bytes at " +
                                                   std::to_string(theOffset) + " can't be read" +
                                                   (errno != 0 ? std::string(": ") + std::strerror(errno) : std::string()));
}
