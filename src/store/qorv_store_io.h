// Small file helpers shared by the store's readers and writers (not part of the store's API).
#pragma once

#include <cstdio>
#include <string>
#include <vector>

#include "qorv_line_pool.h"

/// Closes a stdio file at the end of a scope.
class CStdioFile {
public:
    explicit CStdioFile(FILE* theFile) : mFile(theFile) {}
    ~CStdioFile()
    {
        if (mFile) std::fclose(mFile);
    }
    CStdioFile(const CStdioFile&) = delete;
    CStdioFile& operator=(const CStdioFile&) = delete;
    FILE* get() const { return mFile; }

private:
    FILE* mFile;
};

/// Reads one whole line (of any length) without its line feed, through a pool buffer; false at the end.
bool fqorvReadWholeLine(FILE* theFile, CPoolBufferLease& theLease, std::string& theLine);

/// Reads all lines of a text file through a pool buffer; false when it can't be opened.
bool fqorvReadAllLines(const std::string& thePath, std::vector<std::string>& theLines);

/// The temporary name used by fqorvWriteAtomically.
std::string fqorvTemporaryName(const std::string& thePath);
/// Checks a written temporary file before it takes the place of thePath; null checks nothing.
using QorvWrittenCheck = bool (*)(const std::string& theTemporary, const void* theContext);
/// Ends an atomic write: closes, checks, renames into place on success, removes the temporary otherwise.
bool fqorvFinishAtomicWrite(FILE* theFile, const std::string& theTemporary, const std::string& thePath, bool theOk,
                            QorvWrittenCheck theCheck = nullptr, const void* theContext = nullptr);

/// Writes a file under a temporary name in the same directory and renames it into place, so that
/// a failed write never leaves a truncated file in place of a good one. theBody(FILE*) writes the
/// content and answers false on failure; theCheck, when given, must accept the written file.
template <typename Body>
bool fqorvWriteAtomically(const std::string& thePath, Body&& theBody, QorvWrittenCheck theCheck = nullptr,
                          const void* theContext = nullptr)
{
    const std::string aTemporary = fqorvTemporaryName(thePath);
    FILE* aFile = std::fopen(aTemporary.c_str(), "wb");
    if (!aFile) return false;
    const bool aOk = theBody(aFile);
    return fqorvFinishAtomicWrite(aFile, aTemporary, thePath, aOk, theCheck, theContext);
}

/// Copies a file byte for byte under a temporary name and renames the copy into place.
bool fqorvCopyAtomically(const std::string& theFrom, const std::string& theTo);
