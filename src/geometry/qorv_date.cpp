// Dates of the headers: parsing, civil calendar arithmetic, text form.
#include "qorv_date.h"

#include <cmath>
#include <cstdio>
#include <cstring>
#include <string>

#include "qorv_enviroment.h"
#include "qorv_errors.h"

// Days from civil and back: proleptic Gregorian calendar, eras of 400 years (146097 days), with
// the year taken to begin on 1 March so that the leap day is the last day of a year.
long fqorvDaysFromCivil(int theYear, int theMonth, int theDay)
{
    const long y = static_cast<long>(theYear) - (theMonth <= 2 ? 1 : 0);
    const long era = (y >= 0 ? y : y - 399) / 400;
    const long yoe = y - era * 400;                                            // 0 .. 399
    const long mp = (theMonth + 9) % 12;                                       // March = 0
    const long doy = (153 * mp + 2) / 5 + theDay - 1;                          // 0 .. 365
    const long doe = yoe * 365 + yoe / 4 - yoe / 100 + doy;                    // 0 .. 146096
    return era * 146097 + doe - 719468;                                        // 1970-01-01 = 0
}

void fqorvCivilFromDays(long theDays, int& theYear, int& theMonth, int& theDay)
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

namespace {

/// Reads exactly theCount digits at theText; blanks count as zeros when theBlankIsZero.
bool readDigits(const char* theText, int theCount, bool theBlankIsZero, int& theValue)
{
    theValue = 0;
    for (int i = 0; i < theCount; ++i) {
        char c = theText[i];
        if (c == ' ' && theBlankIsZero) c = '0';
        if (c < '0' || c > '9') return false;
        theValue = theValue * 10 + (c - '0');
    }
    return true;
}

int daysInMonth(int theYear, int theMonth)
{
    return static_cast<int>(fqorvDaysFromCivil(theMonth == 12 ? theYear + 1 : theYear, theMonth == 12 ? 1 : theMonth + 1, 1) -
                            fqorvDaysFromCivil(theYear, theMonth, 1));
}

}  // namespace

bool CQorvDate::parse(const char* theText)
{
    if (theText == nullptr) return false;
    // The day: two digits, or a blank and one digit.
    char aDay[2] = {theText[0], theText[0] == '\0' ? '\0' : theText[1]};
    if (aDay[0] == ' ') aDay[0] = '0';
    int aD = 0;
    if (!readDigits(aDay, 2, false, aD) || theText[2] != '-') return false;
    int aM = 0;
    for (int m = 0; m < 12; ++m)
        if (std::strncmp(theText + 3, CQORV_MONTH_NAMES[m], 3) == 0) aM = m + 1;
    if (aM == 0 || theText[6] != '-') return false;
    int aY = 0;
    if (!readDigits(theText + 7, 4, true, aY)) return false;
    if (aY < 1970 || aY > 2100) return false;
    int aHour = 0, aMin = 0, aSec = 0;
    if (theText[11] != ' ' || !readDigits(theText + 12, 2, true, aHour) || theText[14] != ':' ||
        !readDigits(theText + 15, 2, true, aMin) || theText[17] != ':' || !readDigits(theText + 18, 2, true, aSec))
        return false;
    // Fraction: any number of digits after the point (six in the headers), optional.
    double aFraction = 0.0;
    const char* p = theText + 20;
    if (*p == '.') {
        double aScale = 0.1;
        for (++p; *p >= '0' && *p <= '9'; ++p, aScale *= 0.1) aFraction += (*p - '0') * aScale;
    }
    while (*p == ' ' || *p == '\r' || *p == '\n' || *p == '\t') ++p;
    if (*p != '\0') return false;
    if (aD < 1 || aD > daysInMonth(aY, aM) || aHour > 23 || aMin > 59 || aSec > 60) return false;
    mYear = aY;
    mMonth = aM;
    mDay = aD;
    mDayNumber = fqorvDaysFromCivil(aY, aM, aD);
    mSeconds = aHour * 3600.0 + aMin * 60.0 + aSec + aFraction;
    return true;
}

int CQorvDate::dayOfYear() const
{
    return static_cast<int>(mDayNumber - fqorvDaysFromCivil(mYear, 1, 1)) + 1;
}

void CQorvDate::set(long theDayNumber, double theSeconds)
{
    const double aWhole = std::floor(theSeconds / 86400.0);
    mDayNumber = theDayNumber + static_cast<long>(aWhole);
    mSeconds = theSeconds - aWhole * 86400.0;
    fqorvCivilFromDays(mDayNumber, mYear, mMonth, mDay);
}

std::string CQorvDate::text() const
{
    long aMicro = std::lround(mSeconds * 1.0e6);
    CQorvDate aDate = *this;
    if (aMicro >= 86400L * 1000000L) {  // rounding reached midnight
        aDate.set(mDayNumber + 1, 0.0);
        aMicro = 0;
    }
    const long aSec = aMicro / 1000000L;
    char aBuffer[64];
    std::snprintf(aBuffer, sizeof aBuffer, "%02d-%s-%04d %02ld:%02ld:%02ld.%06ld", aDate.mDay,
                  CQORV_MONTH_NAMES[aDate.mMonth - 1], aDate.mYear, aSec / 3600, (aSec / 60) % 60, aSec % 60,
                  aMicro % 1000000L);
    return aBuffer;
}

CQorvDate fqorvParseDateField(const char* theText, const char* theFieldName)
{
    CQorvDate aDate;
    if (!aDate.parse(theText)) {
        fdfTrace("\nDate not understood [%s] in %s\n", theText == nullptr ? "" : theText, theFieldName);
        QORV_FATAL(CQORV_ERR_MANDATORY, theFieldName);
    }
    return aDate;
}
