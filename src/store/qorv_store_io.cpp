// File helpers of the store: whole-line reading through the pool and atomic replacement of files.
#include "qorv_store_io.h"

#include <cstring>
#include <unistd.h>

bool fqorvReadWholeLine(FILE* theFile, CPoolBufferLease& theLease, std::string& theLine)
{
    theLine.clear();
    char* aBuffer = theLease.data();
    const int aSize = static_cast<int>(theLease.size());
    bool aAny = false;
    while (std::fgets(aBuffer, aSize, theFile)) {
        aAny = true;
        const std::size_t aLen = std::strlen(aBuffer);
        if (aLen > 0 && aBuffer[aLen - 1] == '\n') {
            theLine.append(aBuffer, aLen - 1);
            return true;
        }
        theLine.append(aBuffer, aLen);
    }
    return aAny;
}

bool fqorvReadAllLines(const std::string& thePath, std::vector<std::string>& theLines)
{
    theLines.clear();
    FILE* aFile = std::fopen(thePath.c_str(), "rb");
    if (!aFile) return false;
    CStdioFile aCloser(aFile);
    CPoolBufferLease aLease;
    std::string aLine;
    while (fqorvReadWholeLine(aFile, aLease, aLine)) theLines.push_back(aLine);
    return true;
}

std::string fqorvTemporaryName(const std::string& thePath)
{
    return thePath + ".tmp" + std::to_string(static_cast<long>(::getpid()));
}

bool fqorvFinishAtomicWrite(FILE* theFile, const std::string& theTemporary, const std::string& thePath, bool theOk,
                            QorvWrittenCheck theCheck, const void* theContext)
{
    bool aOk = theOk && std::fflush(theFile) == 0 && !std::ferror(theFile);
    if (std::fclose(theFile) != 0) aOk = false;
    if (aOk && theCheck && !theCheck(theTemporary, theContext)) aOk = false;
    if (aOk && std::rename(theTemporary.c_str(), thePath.c_str()) != 0) aOk = false;
    if (!aOk) std::remove(theTemporary.c_str());
    return aOk;
}

bool fqorvCopyAtomically(const std::string& theFrom, const std::string& theTo)
{
    FILE* aIn = std::fopen(theFrom.c_str(), "rb");
    if (!aIn) return false;
    CStdioFile aCloser(aIn);
    return fqorvWriteAtomically(theTo, [&](FILE* theOut) {
        char aBuffer[1 << 16];
        std::size_t n;
        while ((n = std::fread(aBuffer, 1, sizeof aBuffer, aIn)) > 0)
            if (std::fwrite(aBuffer, 1, n, theOut) != n) return false;
        return !std::ferror(aIn);
    });
}
