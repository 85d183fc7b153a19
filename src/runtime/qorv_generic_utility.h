// String, file-name and scalar helpers shared by every subsystem.
//
// The string helpers return text newly allocated with malloc; the caller owns it and releases it
// with free() (or hands it to a QorvString). A null first operand yields a null result.
#pragma once

#include <cmath>
#include <cstddef>
#include <memory>
#include <string>
#include <vector>

/// Owner of a helper's result: frees with free().
struct QorvFreeDeleter {
    void operator()(char* p) const noexcept;
};
using QorvString = std::unique_ptr<char, QorvFreeDeleter>;

/// Copy of `a`; a carriage return in `a` ends the copy there.
char* fqorvStrDup(const char* a);
/// `a` followed by `b`, cut at the first carriage return.
char* fqorvStrCat(const char* a, const char* b);
/// Like fqorvStrCat, and frees `a`.
char* fqorvStrCatFree(char* a, const char* b);
/// `a`, one underscore, `b`.
char* fqorvJoin(const char* a, const char* b);
/// printf-style text.
char* fqorvFormat(const char* format, ...) __attribute__((format(printf, 1, 2)));
/// True when `a` is longer than `b` and ends in `b`, compared exactly and then without regard to case.
bool fqorvEndsWith(const char* a, const char* b);
/// In place: cuts the tail `b` from `a` when it matches exactly or without regard to case;
/// `a` must be longer than `b`. Returns true when something was cut.
bool fqorvCutSuffix(char* a, const char* b);
/// False for null, an empty name and a name holding "NotOK"; otherwise whether the file exists.
bool fqorvFileExists(const char* a);

/// std::string forms used by code that owns its texts.
bool fqorvEndsWith(const std::string& a, const std::string& b);
std::string fqorvCutSuffix(std::string a, const std::string& b);
inline bool fqorvFileExists(const std::string& a) { return fqorvFileExists(a.c_str()); }
std::string fqorvStringFormat(const char* format, ...) __attribute__((format(printf, 1, 2)));
/// Threads for the large transforms and the per-sample loops: QORVEX_THREADS when it holds a
/// positive number, else the processors this process may run on (its affinity mask), at least 1.
int fqorvThreadCount();

/// Writes a whole text under a temporary name beside thePath and renames it into place, so that a
/// full or failing disk leaves the old file (or none), never an empty or cut one. False on failure.
bool fqorvWriteTextAtomically(const std::string& thePath, const std::string& theText);

/// What fqorvReadTextFile found.
enum class CQorvTextRead { Ok, Missing, NulByte, LineTooLong, TooLarge };

/// Longest line of a text file for arguments, lists and catalogues, in characters.
inline constexpr std::size_t CQORV_TEXT_LINE_LIMIT = 10000;
/// Most bytes read from such a file: 16 MiB.
inline constexpr std::size_t CQORV_TEXT_FILE_LIMIT = 1u << 24;

/// Reads a text file line by line for arguments, lists and catalogues. Blanks (only ' ') are cut
/// at both ends, a carriage return ends a line where it stands, and a line that begins with '#'
/// ends the reading. Reading is bounded: a NUL byte, a line over CQORV_TEXT_LINE_LIMIT characters
/// or more than CQORV_TEXT_FILE_LIMIT bytes end it with that finding and no lines.
CQorvTextRead fqorvReadTextFile(const char* thePath, std::vector<std::string>& theLines);
/// The same; false for anything but a clean read.
bool fqorvReadTextLines(const char* thePath, std::vector<std::string>& theLines);
/// The finding in words ("holds a NUL byte", ...).
const char* fqorvTextReadWords(CQorvTextRead theRead);

namespace NQORV_UTILITY {

template <typename T>
constexpr T square(T x) { return x * x; }
template <typename T>
constexpr T minValue(T a, T b) { return a < b ? a : b; }
template <typename T>
constexpr T maxValue(T a, T b) { return a > b ? a : b; }
template <typename T>
constexpr T absValue(T a) { return a < 0 ? -a : a; }

/// x + 0.5 truncated for x above 0, x - 0.5 truncated otherwise.
inline long nint(double x) { return x > 0.0 ? static_cast<long>(x + 0.5) : static_cast<long>(x - 0.5); }

/// Largest power of two not above n (1 for n below 2).
long largestPowerOfTwo(long n);

/// Smallest normal single-precision value: the tolerance of the null comparison.
inline constexpr double CQORV_NULL_TOLERANCE = 1.1754943508222875e-38;

/// Null comparison: equal when both are NaN, or when neither is and they differ by at most the
/// tolerance; one NaN against a number is unequal.
inline bool isNullValue(double a, double b)
{
    const bool an = std::isnan(a), bn = std::isnan(b);
    if (an || bn) return an && bn;
    return std::fabs(a - b) <= CQORV_NULL_TOLERANCE;
}

}  // namespace NQORV_UTILITY

/// Speed of light in vacuum, m/s.
inline constexpr double CQORV_LIGHT_SPEED = 299792458.0;
/// Marks "no value" in tables.
inline constexpr double CQORV_NO_VALUE = -9999.0;
