// Dates of the headers: "DD-MMM-YYYY hh:mm:ss.uuuuuu" in UTC, held as a day number (days since
// 1 January 1970) and the seconds of that day.
#pragma once

#include <string>

/// A UTC instant as the geometry code uses it: civil date, day number and seconds of the day.
class CQorvDate {
public:
    /// Parses "DD-MMM-YYYY hh:mm:ss.uuuuuu" (MMM "JAN" .. "DEC", upper case). A one-digit day may
    /// be padded with a blank; blanks in the year become zeros. False for a malformed text and for
    /// years outside 1970 to 2100; the object is then left unchanged.
    bool parse(const char* theText);

    /// Days since 1 January 1970 (that day is 0).
    long dayNumber() const { return mDayNumber; }
    /// Seconds since midnight of the day, with the microseconds of the text.
    double secondsOfDay() const { return mSeconds; }
    /// Day of the year, 1 for 1 January.
    int dayOfYear() const;

    /// Sets the instant from a day number and seconds; seconds outside [0, 86400) move the day.
    void set(long theDayNumber, double theSeconds);
    /// The text form "DD-MMM-YYYY hh:mm:ss.uuuuuu" (microseconds rounded).
    std::string text() const;

    int mYear = 1970;
    int mMonth = 1;  // 1 .. 12
    int mDay = 1;    // 1 .. 31
    long mDayNumber = 0;
    double mSeconds = 0.0;
};

/// Days since 1 January 1970 of a proleptic Gregorian date (month 1 .. 12).
long fqorvDaysFromCivil(int theYear, int theMonth, int theDay);
/// The civil date of a day number (days since 1 January 1970).
void fqorvCivilFromDays(long theDays, int& theYear, int& theMonth, int& theDay);

/// Parses the date text of a header field; a text that does not parse is failure 848641 with the
/// field's name (trace: the text).
CQorvDate fqorvParseDateField(const char* theText, const char* theFieldName);
