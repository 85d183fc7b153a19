// Helpers of the raster tests: parameters, file bytes, expected byte layouts.
#pragma once

#include <cstdint>
#include <cstring>
#include <fstream>
#include <string>
#include <vector>

#include <sys/stat.h>

#include "qorv_raster_file.h"

namespace rtest {

inline CRasterFileParam param(const std::string& theName, int theLines, int thePixels, int theCellType,
                              bool theMSBF = false)
{
    CRasterFileParam p;
    p.mFileName = theName;
    p.mNrOfLinesPerImage = theLines;
    p.mNrOfPixelsPerLine = thePixels;
    p.mCellType = theCellType;
    p.mByteOrderMSBF = theMSBF;
    p.mDummyVal = -9999.0;
    return p;
}

inline std::vector<uint8_t> fileBytes(const std::string& thePath)
{
    std::ifstream in(thePath, std::ios::binary);
    return std::vector<uint8_t>((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
}

inline void writeBytes(const std::string& thePath, const std::vector<uint8_t>& theBytes)
{
    std::ofstream out(thePath, std::ios::binary | std::ios::trunc);
    out.write(reinterpret_cast<const char*>(theBytes.data()), static_cast<std::streamsize>(theBytes.size()));
}

inline long long fileSize(const std::string& thePath)
{
    struct stat s;
    return stat(thePath.c_str(), &s) == 0 ? static_cast<long long>(s.st_size) : -1;
}

/// Bytes of native values reversed per component of theGroup bytes (the other byte order).
inline std::vector<uint8_t> swapped(std::vector<uint8_t> theBytes, int theGroup)
{
    if (theGroup < 2) return theBytes;
    for (std::size_t i = 0; i + theGroup <= theBytes.size(); i += theGroup)
        for (int a = 0, b = theGroup - 1; a < b; ++a, --b) std::swap(theBytes[i + a], theBytes[i + b]);
    return theBytes;
}

template <typename T>
std::vector<uint8_t> asBytes(const std::vector<T>& theValues)
{
    std::vector<uint8_t> aBytes(theValues.size() * sizeof(T));
    std::memcpy(aBytes.data(), theValues.data(), aBytes.size());
    return aBytes;
}

template <typename T>
std::vector<T> fromBytes(const uint8_t* theBytes, std::size_t theCount)
{
    std::vector<T> aValues(theCount);
    std::memcpy(aValues.data(), theBytes, theCount * sizeof(T));
    return aValues;
}

}  // namespace rtest
