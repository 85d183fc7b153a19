#include "qorv_sim_geodesy.h"

#include <cstdio>
#include <cstdlib>

namespace {

const char* const CQORV_SIM_MONTHS[12] = {"JAN", "FEB", "MAR", "APR", "MAY", "JUN",
                                          "JUL", "AUG", "SEP", "OCT", "NOV", "DEC"};

}  // namespace

CSimVec3 fqorvSimGeodeticToEcef(const CSimEllipsoid& theEllipsoid, double theLat, double theLon, double theHeight)
{
    const double n = theEllipsoid.primeVertical(theLat);
    const double c = std::cos(theLat);
    return {(n + theHeight) * c * std::cos(theLon), (n + theHeight) * c * std::sin(theLon),
            (n * (1.0 - theEllipsoid.e2()) + theHeight) * std::sin(theLat)};
}

void fqorvSimEcefToGeodetic(const CSimEllipsoid& theEllipsoid, const CSimVec3& thePos, double& theLat,
                            double& theLon, double& theHeight)
{
    const double e2 = theEllipsoid.e2();
    const double p = std::hypot(thePos.x, thePos.y);
    theLon = std::atan2(thePos.y, thePos.x);
    // Fixed-point iteration on latitude; each pass gains several digits near the surface and
    // at orbit heights alike.
    double aLat = std::atan2(thePos.z, p * (1.0 - e2));
    double aHeight = 0.0;
    for (int i = 0; i < 20; ++i) {
        const double n = theEllipsoid.primeVertical(aLat);
        const double c = std::cos(aLat);
        aHeight = std::fabs(c) > 1e-9 ? p / c - n : std::fabs(thePos.z) - theEllipsoid.mB;
        const double aNext = std::atan2(thePos.z, p * (1.0 - e2 * n / (n + aHeight)));
        const bool aDone = std::fabs(aNext - aLat) < 1e-15;
        aLat = aNext;
        if (aDone) break;
    }
    const double n = theEllipsoid.primeVertical(aLat);
    const double c = std::cos(aLat);
    theHeight = std::fabs(c) > 1e-9 ? p / c - n : std::fabs(thePos.z) - theEllipsoid.mB;
    theLat = aLat;
}

CSimVec3 fqorvSimEllipsoidNormal(double theLat, double theLon)
{
    return {std::cos(theLat) * std::cos(theLon), std::cos(theLat) * std::sin(theLon), std::sin(theLat)};
}

CSimUtc CSimUtc::plus(double theSeconds) const
{
    CSimUtc r;
    const double s = mSeconds + theSeconds;
    const double d = std::floor(s / 86400.0);
    r.mDay = mDay + static_cast<long>(d);
    r.mSeconds = s - d * 86400.0;
    if (r.mSeconds >= 86400.0) {  // rounding at the top of the day
        r.mSeconds -= 86400.0;
        ++r.mDay;
    }
    return r;
}

// Days from civil and back: the proleptic Gregorian calendar by era arithmetic.
long fqorvSimDaysFromCivil(int theYear, int theMonth, int theDay)
{
    const long y = theYear - (theMonth <= 2 ? 1 : 0);
    const long era = (y >= 0 ? y : y - 399) / 400;
    const long yoe = y - era * 400;
    const long doy = (153 * (theMonth + (theMonth > 2 ? -3 : 9)) + 2) / 5 + theDay - 1;
    const long doe = yoe * 365 + yoe / 4 - yoe / 100 + doy;
    return era * 146097 + doe - 719468;
}

void fqorvSimCivilFromDays(long theDays, int& theYear, int& theMonth, int& theDay)
{
    const long z = theDays + 719468;
    const long era = (z >= 0 ? z : z - 146096) / 146097;
    const long doe = z - era * 146097;
    const long yoe = (doe - doe / 1460 + doe / 36524 - doe / 146096) / 365;
    const long doy = doe - (365 * yoe + yoe / 4 - yoe / 100);
    const long mp = (5 * doy + 2) / 153;
    theDay = static_cast<int>(doy - (153 * mp + 2) / 5 + 1);
    theMonth = static_cast<int>(mp < 10 ? mp + 3 : mp - 9);
    theYear = static_cast<int>(yoe + era * 400 + (theMonth <= 2 ? 1 : 0));
}

bool fqorvSimParseIsoDate(const std::string& theText, CSimUtc& theUtc)
{
    int y = 0, mo = 0, d = 0, h = 0, mi = 0;
    char aSep = 0;
    int aUsed = 0;
    if (std::sscanf(theText.c_str(), "%4d-%2d-%2d%c%2d:%2d:%n", &y, &mo, &d, &aSep, &h, &mi, &aUsed) < 6 || aUsed == 0)
        return false;
    if (aSep != 'T' && aSep != ' ') return false;
    char* aEnd = nullptr;
    const double s = std::strtod(theText.c_str() + aUsed, &aEnd);
    if (aEnd == theText.c_str() + aUsed || *aEnd != '\0') return false;
    if (mo < 1 || mo > 12 || d < 1 || d > 31 || h < 0 || h > 23 || mi < 0 || mi > 59 || s < 0.0 || s >= 61.0)
        return false;
    theUtc.mDay = fqorvSimDaysFromCivil(y, mo, d);
    theUtc.mSeconds = h * 3600.0 + mi * 60.0 + s;
    return true;
}

namespace {

/// Splits an instant into date and time fields rounded to the microsecond.
void splitToMicroseconds(const CSimUtc& theUtc, int& y, int& mo, int& d, int& h, int& mi, int& s, long& us)
{
    long long aMicro = std::llround(theUtc.mSeconds * 1e6);
    long aDay = theUtc.mDay;
    if (aMicro >= 86400LL * 1000000LL) {
        aMicro -= 86400LL * 1000000LL;
        ++aDay;
    }
    fqorvSimCivilFromDays(aDay, y, mo, d);
    const long long aWhole = aMicro / 1000000LL;
    us = static_cast<long>(aMicro % 1000000LL);
    h = static_cast<int>(aWhole / 3600);
    mi = static_cast<int>((aWhole / 60) % 60);
    s = static_cast<int>(aWhole % 60);
}

}  // namespace

std::string fqorvSimIsoDate(const CSimUtc& theUtc)
{
    int y, mo, d, h, mi, s;
    long us;
    splitToMicroseconds(theUtc, y, mo, d, h, mi, s, us);
    char aText[64];
    std::snprintf(aText, sizeof aText, "%04d-%02d-%02dT%02d:%02d:%02d.%06ld", y, mo, d, h, mi, s, us);
    return aText;
}

std::string fqorvSimHeaderDate(const CSimUtc& theUtc)
{
    int y, mo, d, h, mi, s;
    long us;
    splitToMicroseconds(theUtc, y, mo, d, h, mi, s, us);
    char aText[64];
    std::snprintf(aText, sizeof aText, "%02d-%s-%04d %02d:%02d:%02d.%06ld", d, CQORV_SIM_MONTHS[mo - 1], y, h, mi,
                  s, us);
    return aText;
}

double fqorvSimGreenwichAngle(const CSimUtc& theUtc)
{
    // Earth rotation angle of the IERS conventions with UT1 = UTC, days counted from J2000.0. The
    // whole days of 1.0027... * days add whole turns only, so only their fraction is kept.
    const double aDays = static_cast<double>(theUtc.mDay - 10957) + (theUtc.mSeconds - 43200.0) / 86400.0;
    double aTurns = 0.7790572732640 + 0.00273781191135448 * aDays + (aDays - std::floor(aDays));
    aTurns -= std::floor(aTurns);
    return 2.0 * CQORV_SIM_PI * aTurns;
}
