// CEOS records of the simulated archives: the record header, the text fields, dates, the file
// descriptor's head and the platform position record, and files written under a ".part" name.
#include "qorv_sim_ceos.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <stdexcept>

#include "qorv_sim_format.h"
#include "qorv_sim_geodesy.h"

namespace fs = std::filesystem;

namespace NQORV_SIM_CEOS {

/// A record of theLength bytes: its 12-byte header, the rest blank (CEOS text records) or zero.
CRecord ceosRecord(uint32_t theSequence, const uint8_t (&theTypes)[4], uint32_t theLength, bool theBlank)
{
    CRecord r(theLength, theBlank ? ' ' : 0);
    fqorvSimPutBE32(r.data(), theSequence);
    std::memcpy(r.data() + 4, theTypes, 4);
    fqorvSimPutBE32(r.data() + 8, theLength);
    return r;
}

/// An field: text left-justified, blank padded.
void putA(CRecord& r, int theOffset, int theWidth, const std::string& theText)
{
    if (static_cast<int>(theText.size()) > theWidth || theOffset + theWidth > static_cast<int>(r.size()))
        throw std::runtime_error("the CEOS field at " + std::to_string(theOffset) + " cannot hold \"" + theText + "\"");
    std::memset(r.data() + theOffset, ' ', static_cast<std::size_t>(theWidth));
    std::memcpy(r.data() + theOffset, theText.data(), theText.size());
}

/// Right-justified in theWidth characters.
void putRight(CRecord& r, int theOffset, int theWidth, const std::string& theText)
{
    if (static_cast<int>(theText.size()) > theWidth)
        throw std::runtime_error("the CEOS field at " + std::to_string(theOffset) + " cannot hold " + theText);
    putA(r, theOffset, theWidth, std::string(static_cast<std::size_t>(theWidth) - theText.size(), ' ') + theText);
}

/// In field.
void putI(CRecord& r, int theOffset, int theWidth, long long theValue)
{
    putRight(r, theOffset, theWidth, std::to_string(theValue));
}

/// Fn field: fixed notation with as many decimals (up to theMaxDecimals) as the width holds; NaN
/// writes theFiller, by default "-9999999.9" (as many nines as fit a narrower field).
void putF(CRecord& r, int theOffset, int theWidth, double theValue, const char* theFiller, int theMaxDecimals)
{
    if (std::isnan(theValue)) {
        const std::string aNines(static_cast<std::size_t>(std::min(7, theWidth - 3)), '9');
        putRight(r, theOffset, theWidth, theFiller ? theFiller : "-" + aNines + ".9");
        return;
    }
    char aText[64];
    for (int d = theMaxDecimals; d >= 0; --d) {
        std::snprintf(aText, sizeof aText, "%.*f", d, theValue);
        if (static_cast<int>(std::strlen(aText)) <= theWidth) {
            putRight(r, theOffset, theWidth, aText);
            return;
        }
    }
    throw std::runtime_error("the CEOS field at " + std::to_string(theOffset) + " cannot hold " + std::to_string(theValue));
}

CCivilTime civilTime(long theDay, double theSeconds, double theUnit)
{
    const long long aPerDay = std::llround(86400.0 / theUnit);
    const long long aPerSecond = std::llround(1.0 / theUnit);
    const long long aUnits = std::llround(theSeconds / theUnit);
    long long aDays = aUnits / aPerDay, aRest = aUnits % aPerDay;
    if (aRest < 0) {
        aRest += aPerDay;
        --aDays;
    }
    CCivilTime c{};
    c.mDayNumber = theDay + static_cast<long>(aDays);
    fqorvSimCivilFromDays(c.mDayNumber, c.mYear, c.mMonth, c.mDay);
    c.mDayOfYear = static_cast<int>(c.mDayNumber - fqorvSimDaysFromCivil(c.mYear, 1, 1)) + 1;
    c.mSecondOfDay = static_cast<long>(aRest / aPerSecond);
    c.mFraction = static_cast<long>(aRest % aPerSecond);
    c.mHour = static_cast<int>(c.mSecondOfDay / 3600);
    c.mMinute = static_cast<int>(c.mSecondOfDay / 60 % 60);
    c.mSecond = static_cast<int>(c.mSecondOfDay % 60);
    return c;
}

/// "YYYYMMDDhhmmssttt": the leader's time text, to the millisecond.
std::string ceosTime(long theDay, double theSeconds)
{
    const CCivilTime c = civilTime(theDay, theSeconds, 1e-3);
    char aText[32];
    std::snprintf(aText, sizeof aText, "%04d%02d%02d%02d%02d%02d%03ld", c.mYear, c.mMonth, c.mDay, c.mHour, c.mMinute,
                  c.mSecond, c.mFraction);
    return aText;
}

void writeWhole(const fs::path& thePath, const std::vector<CRecord>& theRecords)
{
    CPartFile f(thePath);
    for (const CRecord& r : theRecords) f.append(r);
    f.close();
}

fs::path partOf(const fs::path& thePath) { return fs::path(thePath.string() + ".part"); }

/// The common head of a file descriptor record.
void putDescriptorHead(CRecord& r, const char* theFileName)
{
    putA(r, 12, 2, "A");
    putA(r, 16, 12, "CEOS-SAR-CCT");
    putA(r, 28, 2, "A");
    putA(r, 30, 2, "A");
    putA(r, 32, 12, "QORVEX-SIM");
    putI(r, 44, 4, 1);
    putA(r, 48, 16, theFileName);
    putA(r, 64, 4, "FSEQ");
    putI(r, 68, 8, 1);
    putI(r, 76, 4, 4);
    putA(r, 80, 4, "FTYP");
    putI(r, 84, 8, 5);
    putI(r, 92, 4, 4);
    putA(r, 96, 4, "FLGT");
    putI(r, 100, 8, 9);
    putI(r, 108, 4, 4);
}

CRecord platformPosition(uint32_t theSequence, const uint8_t (&theTypes)[4], long theReferenceDay,
                         const std::vector<CStateVector>& v, std::size_t theMinimum)
{
    const uint32_t aLength = static_cast<uint32_t>(VECTOR_BASE + VECTOR_SIZE * std::max(theMinimum, v.size()));
    CRecord r = ceosRecord(theSequence, theTypes, aLength, true);
    const CCivilTime c = civilTime(theReferenceDay, v.front().mTime, 1e-6);
    putI(r, 140, 4, static_cast<long long>(v.size()));
    putI(r, 144, 4, c.mYear);
    putI(r, 148, 4, c.mMonth);
    putI(r, 152, 4, c.mDay);
    putI(r, 156, 4, c.mDayOfYear);
    // Seconds of the day of the first vector, whose date stands above.
    putF(r, 160, 22, v.front().mTime - 86400.0 * static_cast<double>(c.mDayNumber - theReferenceDay), "", 9);
    putF(r, 182, 22, v[1].mTime - v[0].mTime, "", 9);
    putA(r, 204, 64, "Earth Centred Rotating");
    for (std::size_t k = 0; k < v.size(); ++k) {
        const int aAt = VECTOR_BASE + VECTOR_SIZE * static_cast<int>(k);
        for (int i = 0; i < 3; ++i) {
            putF(r, aAt + 22 * i, 22, v[k].mPosition[i], "", 9);
            putF(r, aAt + 66 + 22 * i, 22, v[k].mVelocity[i], "", 9);
        }
    }
    return r;
}

}  // namespace NQORV_SIM_CEOS
