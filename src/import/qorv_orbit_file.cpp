// Outside orbit files: one state vector a line, UTC times turned into seconds from a reference day.
#include "qorv_orbit_file.h"

#include <charconv>
#include <cmath>
#include <fstream>
#include <string>
#include <string_view>
#include <system_error>

#include "qorv_date.h"
#include "qorv_import_failure.h"

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

}  // namespace

std::vector<CStateVector> fqorvReadOrbitFile(const std::filesystem::path& thePath, long theReferenceDay)
{
    std::error_code aError;
    if (!std::filesystem::exists(thePath, aError)) fqorvImportFail(CQORV_ERR_MISSING_FILE, thePath.string());
    std::ifstream aFile(thePath);
    if (!aFile || std::filesystem::is_directory(thePath, aError)) {
        fqorvImportFail(CQORV_ERR_IMPORT_ORBIT_FILE, thePath.string() + " cannot be opened");
    }

    std::vector<CStateVector> aVectors;
    std::string aLine;
    long aLineNumber = 0, aPreviousLine = 0;
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
        if (!aVectors.empty() && !(v.mTime > aVectors.back().mTime)) {
            fqorvImportFail(CQORV_ERR_IMPORT_TIME_ORDER, thePath.string() + " line " + std::to_string(aLineNumber) +
                                                             ": its time is not after that of line " +
                                                             std::to_string(aPreviousLine));
        }
        aVectors.push_back(v);
        aPreviousLine = aLineNumber;
    }
    if (aFile.bad()) fqorvImportFail(CQORV_ERR_IMPORT_ORBIT_FILE, thePath.string() + " cannot be read");
    if (aVectors.size() < static_cast<std::size_t>(kMinimumVectors)) {
        fqorvImportFail(CQORV_ERR_IMPORT_ORBIT_FILE, thePath.string() + " holds " + std::to_string(aVectors.size()) +
                                                         " state vectors, at least " + std::to_string(kMinimumVectors) +
                                                         " are needed");
    }
    return aVectors;
}
