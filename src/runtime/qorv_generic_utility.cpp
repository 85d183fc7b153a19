#include "qorv_generic_utility.h"

#include <strings.h>
#include <sched.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <algorithm>
#include <fstream>
#include <thread>

void QorvFreeDeleter::operator()(char* p) const noexcept { std::free(p); }

namespace {

/// Length of `a` up to its first carriage return.
std::size_t lengthToCarriageReturn(const char* a)
{
    const char* aCr = std::strchr(a, '\r');
    return aCr ? static_cast<std::size_t>(aCr - a) : std::strlen(a);
}

char* allocateText(std::size_t theLength)
{
    char* aText = static_cast<char*>(std::malloc(theLength + 1));
    if (aText) aText[theLength] = '\0';
    return aText;
}

}  // namespace

char* fqorvStrDup(const char* a)
{
    if (!a) return nullptr;
    const std::size_t aLen = lengthToCarriageReturn(a);
    char* aText = allocateText(aLen);
    if (aText) std::memcpy(aText, a, aLen);
    return aText;
}

char* fqorvStrCat(const char* a, const char* b)
{
    if (!a) return nullptr;
    if (!b) b = "";
    const std::size_t aLenA = std::strlen(a), aLenB = std::strlen(b);
    char* aText = allocateText(aLenA + aLenB);
    if (!aText) return nullptr;
    std::memcpy(aText, a, aLenA);
    std::memcpy(aText + aLenA, b, aLenB);
    if (char* aCr = std::strchr(aText, '\r')) *aCr = '\0';
    return aText;
}

char* fqorvStrCatFree(char* a, const char* b)
{
    char* aText = fqorvStrCat(a, b);
    std::free(a);
    return aText;
}

char* fqorvJoin(const char* a, const char* b)
{
    if (!a) return nullptr;
    return fqorvFormat("%s_%s", a, b ? b : "");
}

char* fqorvFormat(const char* format, ...)
{
    if (!format) return nullptr;
    va_list aArgs;
    va_start(aArgs, format);
    char* aText = nullptr;
    if (vasprintf(&aText, format, aArgs) < 0) aText = nullptr;
    va_end(aArgs);
    return aText;
}

std::string fqorvStringFormat(const char* format, ...)
{
    va_list aArgs;
    va_start(aArgs, format);
    char* aText = nullptr;
    const int aLen = vasprintf(&aText, format, aArgs);
    va_end(aArgs);
    if (aLen < 0) return std::string();
    std::string aResult(aText, static_cast<std::size_t>(aLen));
    std::free(aText);
    return aResult;
}

bool fqorvEndsWith(const char* a, const char* b)
{
    if (!a || !b) return false;
    const std::size_t aLenA = std::strlen(a), aLenB = std::strlen(b);
    if (aLenA <= aLenB) return false;
    const char* aTail = a + (aLenA - aLenB);
    return std::strcmp(aTail, b) == 0 || strcasecmp(aTail, b) == 0;
}

bool fqorvEndsWith(const std::string& a, const std::string& b) { return fqorvEndsWith(a.c_str(), b.c_str()); }

bool fqorvCutSuffix(char* a, const char* b)
{
    if (!fqorvEndsWith(a, b)) return false;
    a[std::strlen(a) - std::strlen(b)] = '\0';
    return true;
}

std::string fqorvCutSuffix(std::string a, const std::string& b)
{
    if (fqorvEndsWith(a, b)) a.resize(a.size() - b.size());
    return a;
}

bool fqorvFileExists(const char* a)
{
    if (!a || !*a || std::strstr(a, "NotOK")) return false;
    struct stat aStat {};
    const bool aExists = ::stat(a, &aStat) == 0;
    errno = 0;  // the lookup's error is not a failure of the caller
    return aExists;
}

namespace {

/// Blanks cut at both ends, the text from a carriage return on dropped.
void trimTextLine(std::string& theLine)
{
    const std::size_t aCr = theLine.find('\r');
    if (aCr != std::string::npos) theLine.resize(aCr);
    const std::size_t aFirst = theLine.find_first_not_of(' ');
    if (aFirst == std::string::npos) {
        theLine.clear();
        return;
    }
    const std::size_t aLast = theLine.find_last_not_of(' ');
    theLine = theLine.substr(aFirst, aLast - aFirst + 1);
}

}  // namespace

bool fqorvWriteTextAtomically(const std::string& thePath, const std::string& theText)
{
    const std::string aTemporary = thePath + ".tmp" + std::to_string(static_cast<long>(::getpid()));
    FILE* aFile = std::fopen(aTemporary.c_str(), "wb");
    if (!aFile) return false;
    bool aOk = std::fwrite(theText.data(), 1, theText.size(), aFile) == theText.size();
    aOk = std::fflush(aFile) == 0 && aOk;
    aOk = std::fclose(aFile) == 0 && aOk;
    if (aOk && std::rename(aTemporary.c_str(), thePath.c_str()) != 0) aOk = false;
    if (!aOk) std::remove(aTemporary.c_str());
    return aOk;
}

CQorvTextRead fqorvReadTextFile(const char* thePath, std::vector<std::string>& theLines)
{
    theLines.clear();
    FILE* aFile = thePath ? std::fopen(thePath, "rb") : nullptr;
    if (!aFile) return CQorvTextRead::Missing;
    CQorvTextRead aResult = CQorvTextRead::Ok;
    std::size_t aTotal = 0;
    std::string aLine;
    bool aPending = false;
    for (int c; aResult == CQorvTextRead::Ok;) {
        c = getc_unlocked(aFile);
        if (c == EOF || c == '\n') {
            if (c == EOF && !aPending) break;
            trimTextLine(aLine);
            if (!aLine.empty() && aLine[0] == '#') break;
            theLines.push_back(std::move(aLine));
            aLine.clear();
            aPending = false;
            if (c == EOF) break;
            continue;
        }
        aPending = true;
        if (c == '\0') aResult = CQorvTextRead::NulByte;
        else if (++aTotal > CQORV_TEXT_FILE_LIMIT) aResult = CQorvTextRead::TooLarge;
        else if (aLine.size() >= CQORV_TEXT_LINE_LIMIT) aResult = CQorvTextRead::LineTooLong;
        else aLine += static_cast<char>(c);
    }
    std::fclose(aFile);
    if (aResult != CQorvTextRead::Ok) theLines.clear();
    return aResult;
}

bool fqorvReadTextLines(const char* thePath, std::vector<std::string>& theLines)
{
    return fqorvReadTextFile(thePath, theLines) == CQorvTextRead::Ok;
}

const char* fqorvTextReadWords(CQorvTextRead theRead)
{
    switch (theRead) {
    case CQorvTextRead::Ok: return "read";
    case CQorvTextRead::Missing: return "cannot be opened";
    case CQorvTextRead::NulByte: return "holds a NUL byte";
    case CQorvTextRead::LineTooLong: return "holds a line over 10000 characters";
    case CQorvTextRead::TooLarge: return "is over 16 MiB";
    }
    return "";
}

namespace NQORV_UTILITY {

long largestPowerOfTwo(long n)
{
    long p = 1;
    while (p <= n / 2) p *= 2;
    return p;
}

}  // namespace NQORV_UTILITY

int fqorvThreadCount()
{
    if (const char* aValue = std::getenv("QORVEX_THREADS")) {
        const long aThreads = std::strtol(aValue, nullptr, 10);
        if (aThreads > 0) return static_cast<int>(std::min(aThreads, 256L));
    }
    cpu_set_t aSet;
    CPU_ZERO(&aSet);
    if (sched_getaffinity(0, sizeof(aSet), &aSet) == 0 && CPU_COUNT(&aSet) > 0) return CPU_COUNT(&aSet);
    return static_cast<int>(std::max(1u, std::thread::hardware_concurrency()));
}
