// Outside orbit files: the plain table and the DORIS orbit, UTC times turned into seconds from a
// reference day.
#include "qorv_orbit_file.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <fstream>
#include <string>
#include <string_view>
#include <system_error>

#include "qorv_date.h"
#include "qorv_envisat_headers.h"
#include "qorv_import_failure.h"
#include "qorv_native_formats.h"

namespace {

constexpr int kMinimumVectors = 4;      // the interpolation's window
constexpr std::size_t kQuotedText = 60;  // characters of a faulty line quoted in a failure

/// A faulty line as a failure quotes it: cut short, control characters (a binary file given by
/// mistake) made visible as '?'.
std::string quotedLine(std::string_view theLine)
{
    std::string aText(theLine.substr(0, kQuotedText));
    for (char& c : aText) {
        if (static_cast<unsigned char>(c) < 0x20 || c == 0x7f) c = '?';
    }
    if (theLine.size() > kQuotedText) aText += "...";
    return aText;
}

bool parseDouble(std::string_view theText, double& theValue)
{
    const char* aEnd = theText.data() + theText.size();
    const auto [aStop, aError] = std::from_chars(theText.data(), aEnd, theValue);
    return aError == std::errc() && aStop == aEnd && std::isfinite(theValue);
}

/// The number of theCount digits at theAt, or -1.
int digits(std::string_view theText, std::size_t theAt, int theCount)
{
    int aValue = 0;
    for (int i = 0; i < theCount; ++i) {
        const char c = theText[theAt + static_cast<std::size_t>(i)];
        if (c < '0' || c > '9') return -1;
        aValue = 10 * aValue + (c - '0');
    }
    return aValue;
}

/// "YYYY-MM-DDThh:mm:ss[.f...]" as seconds from the midnight of theReferenceDay; false for any
/// other text or an impossible date.
bool parseTime(std::string_view theText, long theReferenceDay, double& theSeconds)
{
    if (theText.size() < 19 || theText[4] != '-' || theText[7] != '-' || theText[10] != 'T' || theText[13] != ':' ||
        theText[16] != ':') {
        return false;
    }
    const int aYear = digits(theText, 0, 4), aMonth = digits(theText, 5, 2), aDay = digits(theText, 8, 2);
    const int aHour = digits(theText, 11, 2), aMinute = digits(theText, 14, 2);
    if (aYear < 0 || aMonth < 1 || aMonth > 12 || aDay < 1 || aHour < 0 || aHour > 23 || aMinute < 0 || aMinute > 59) {
        return false;
    }
    // The seconds: two digits, then nothing or a point and at least one digit.
    const std::string_view aSecondsText = theText.substr(17);
    if (digits(aSecondsText, 0, 2) < 0) return false;
    if (aSecondsText.size() > 2 && (aSecondsText[2] != '.' || aSecondsText.size() == 3 ||
                                    aSecondsText.find_first_not_of("0123456789", 3) != std::string_view::npos)) {
        return false;
    }
    double aSecond = 0.0;
    if (!parseDouble(aSecondsText, aSecond) || aSecond >= 60.0) return false;
    // A day beyond the month's end comes back from the day number as another date.
    const long aDayNumber = fqorvDaysFromCivil(aYear, aMonth, aDay);
    int y, m, d;
    fqorvCivilFromDays(aDayNumber, y, m, d);
    if (y != aYear || m != aMonth || d != aDay) return false;
    theSeconds = static_cast<double>(aDayNumber - theReferenceDay) * 86400.0 + aHour * 3600.0 + aMinute * 60.0 + aSecond;
    return true;
}

/// One vector from the fields of a line; false unless there are seven and each parses.
bool parseVector(std::string_view theLine, long theReferenceDay, CStateVector& theVector)
{
    std::string_view aFields[8];
    int n = 0;
    std::size_t aAt = theLine.find_first_not_of(" \t");
    while (aAt != std::string_view::npos && n < 8) {
        const std::size_t aEnd = theLine.find_first_of(" \t", aAt);
        aFields[n++] = theLine.substr(aAt, aEnd == std::string_view::npos ? std::string_view::npos : aEnd - aAt);
        aAt = aEnd == std::string_view::npos ? aEnd : theLine.find_first_not_of(" \t", aEnd);
    }
    if (n != 7 || !parseTime(aFields[0], theReferenceDay, theVector.mTime)) return false;
    for (int i = 0; i < 3; ++i) {
        if (!parseDouble(aFields[1 + i], theVector.mPosition[i])) return false;
        if (!parseDouble(aFields[4 + i], theVector.mVelocity[i])) return false;
    }
    return true;
}

/// The vectors of a file in their order, with the checks both kinds of file share: times that
/// increase strictly, enough vectors for the interpolation.
class CVectorList {
public:
    explicit CVectorList(const std::filesystem::path& thePath) : mPath(thePath) {}

    /// Adds the vector of line or record theNumber (theUnit says which).
    void add(const CStateVector& theVector, const char* theUnit, long theNumber)
    {
        if (!mVectors.empty() && !(theVector.mTime > mVectors.back().mTime)) {
            fqorvImportFail(CQORV_ERR_IMPORT_TIME_ORDER, mPath.string() + " " + theUnit + " " + std::to_string(theNumber) +
                                                             ": its time is not after that of " + theUnit + " " +
                                                             std::to_string(mPrevious));
        }
        mVectors.push_back(theVector);
        mPrevious = theNumber;
    }

    std::vector<CStateVector> finish()
    {
        if (mVectors.size() < static_cast<std::size_t>(kMinimumVectors)) {
            fqorvImportFail(CQORV_ERR_IMPORT_ORBIT_FILE, mPath.string() + " holds " + std::to_string(mVectors.size()) +
                                                             " state vectors, at least " + std::to_string(kMinimumVectors) +
                                                             " are needed");
        }
        return std::move(mVectors);
    }

private:
    std::filesystem::path mPath;
    std::vector<CStateVector> mVectors;
    long mPrevious = 0;
};

std::vector<CStateVector> readPlainTable(const std::filesystem::path& thePath, long theReferenceDay)
{
    std::ifstream aFile(thePath);
    std::error_code aError;
    if (!aFile || std::filesystem::is_directory(thePath, aError)) {
        fqorvImportFail(CQORV_ERR_IMPORT_ORBIT_FILE, thePath.string() + " cannot be opened");
    }
    CVectorList aVectors(thePath);
    std::string aLine;
    long aLineNumber = 0;
    while (std::getline(aFile, aLine)) {
        ++aLineNumber;
        if (!aLine.empty() && aLine.back() == '\r') aLine.pop_back();  // written on Windows
        const std::size_t aStart = aLine.find_first_not_of(" \t");
        if (aStart == std::string::npos || aLine[aStart] == '#') continue;

        CStateVector v;
        if (!parseVector(aLine, theReferenceDay, v)) {
            fqorvImportFail(CQORV_ERR_IMPORT_ORBIT_FILE, thePath.string() + " line " + std::to_string(aLineNumber) +
                                                             " is not a time and six numbers: " + quotedLine(aLine));
        }
        aVectors.add(v, "line", aLineNumber);
    }
    if (aFile.bad()) fqorvImportFail(CQORV_ERR_IMPORT_ORBIT_FILE, thePath.string() + " cannot be read");
    return aVectors.finish();
}

/// One DORIS record: the time, then dUT1, x y z, vx vy vz and a quality text; false unless the
/// time and the seven numbers parse.
bool parseDorisRecord(std::string_view theRecord, long theReferenceDay, CStateVector& theVector)
{
    constexpr std::size_t CQORV_TIME_CHARACTERS = 27;   // DD-MMM-YYYY hh:mm:ss.uuuuuu
    if (theRecord.size() <= CQORV_TIME_CHARACTERS || theRecord[CQORV_TIME_CHARACTERS] != ' ') return false;
    CQorvDate aDate;
    if (!aDate.parse(std::string(theRecord.substr(0, CQORV_TIME_CHARACTERS)).c_str())) return false;
    theVector.mTime = static_cast<double>(aDate.dayNumber() - theReferenceDay) * 86400.0 + aDate.secondsOfDay();
    double aNumbers[7];
    std::size_t aAt = CQORV_TIME_CHARACTERS;
    for (double& aNumber : aNumbers) {
        aAt = theRecord.find_first_not_of(' ', aAt);
        if (aAt == std::string_view::npos) return false;
        const std::size_t aEnd = std::min(theRecord.find(' ', aAt), theRecord.size());
        if (!parseDouble(theRecord.substr(aAt, aEnd - aAt), aNumber)) return false;
        aAt = aEnd;
    }
    for (int i = 0; i < 3; ++i) {
        theVector.mPosition[i] = aNumbers[1 + i];
        theVector.mVelocity[i] = aNumbers[4 + i];
    }
    return true;
}

std::vector<CStateVector> readDorisOrbit(const std::filesystem::path& thePath, long theReferenceDay)
{
    uint64_t aFirst = 0;
    try {
        aFirst = fqorvReadEnvisatHeaders(thePath).headersEnd();
    } catch (const CImportFailure& e) {
        if (e.id() != CQORV_ERR_IMPORT_VALUE) throw;
        fqorvImportFail(CQORV_ERR_IMPORT_ORBIT_FILE, thePath.string() + ": a DORIS orbit whose headers can't be read (" +
                                                         e.parameter() + ")");
    }
    std::error_code aError;
    const uint64_t aSize = std::filesystem::file_size(thePath, aError);
    if (aError) fqorvImportFail(CQORV_ERR_IMPORT_ORBIT_FILE, thePath.string() + " cannot be read: " + aError.message());
    const std::vector<uint8_t> aBytes = fqorvReadFileBytes(thePath, aFirst, aSize > aFirst ? aSize - aFirst : 0);
    const std::string_view aText(reinterpret_cast<const char*>(aBytes.data()), aBytes.size());

    CVectorList aVectors(thePath);
    long aRecord = 0;
    for (std::size_t aAt = 0; aAt < aText.size();) {
        const std::size_t aEnd = std::min(aText.find('\n', aAt), aText.size());
        const std::string_view aLine = aText.substr(aAt, aEnd - aAt);
        const uint64_t aByte = aFirst + aAt;
        aAt = aEnd + 1;
        if (aLine.find_first_not_of(" \r") == std::string_view::npos) continue;   // padding at the end
        ++aRecord;
        CStateVector v;
        if (!parseDorisRecord(aLine, theReferenceDay, v)) {
            fqorvImportFail(CQORV_ERR_IMPORT_ORBIT_FILE, thePath.string() + " record " + std::to_string(aRecord) + " at byte " +
                                                             std::to_string(aByte) +
                                                             " is not a time, dUT1 and six numbers: " + quotedLine(aLine));
        }
        aVectors.add(v, "record", aRecord);
    }
    return aVectors.finish();
}

}  // namespace

std::vector<CStateVector> fqorvReadOrbitFile(const std::filesystem::path& thePath, long theReferenceDay)
{
    std::error_code aError;
    if (!std::filesystem::exists(thePath, aError)) fqorvImportFail(CQORV_ERR_MISSING_FILE, thePath.string());
    if (std::filesystem::is_directory(thePath, aError)) {
        fqorvImportFail(CQORV_ERR_IMPORT_ORBIT_FILE, thePath.string() + " cannot be opened");
    }
    const std::string aProduct = fqorvEnvisatProductName(thePath);
    if (aProduct.rfind("DOR_VOR_AX", 0) == 0) return readDorisOrbit(thePath, theReferenceDay);
    if (!aProduct.empty()) {
        fqorvImportFail(CQORV_ERR_IMPORT_OUTSIDE_KIND, thePath.string() + " is the ENVISAT-format product " + aProduct +
                                                           ", not an orbit (a DORIS orbit DOR_VOR_AX or a table of state vectors)");
    }
    return readPlainTable(thePath, theReferenceDay);
}
