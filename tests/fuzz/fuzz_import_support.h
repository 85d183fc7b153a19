// What the harnesses of the importers share: the fixed scenes' orbit, an input written into its
// file (at given places, or CEOS records by their own lengths), the seeds, and the import short of
// writing with the checks of what the chain relies on.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include "qorv_native_reader.h"
#include "qorv_sim_orbit.h"
#include "qorv_state_vectors.h"

namespace qfuzz {

using Bytes = std::vector<uint8_t>;

/// The orbit of the fixed scenes: a Kepler orbit at 30 degrees of argument of latitude at mStart
/// (s from the scene's midnight).
struct CFixedOrbit {
    double mStart;
    CSimKepler mElements;

    explicit CFixedOrbit(double theStart);
    CStateVector vectorAt(double theTime) const;
};

Bytes readAll(const std::filesystem::path& thePath);

/// A file written piece by piece at given places; what lies between stays a hole (zeros).
class CSparseFile {
public:
    explicit CSparseFile(const std::filesystem::path& thePath);
    ~CSparseFile();
    CSparseFile(const CSparseFile&) = delete;
    CSparseFile& operator=(const CSparseFile&) = delete;
    void put(uint64_t theOffset, const uint8_t* theBytes, std::size_t theCount);
    void end(uint64_t theOffset) { mSize = std::max(mSize, theOffset); }

private:
    int mFd;
    uint64_t mSize = 0;
};

/// The CEOS record lengths a compact input follows: above it the rest is written as it is.
inline constexpr uint32_t CEOS_MAX_RECORD = 1u << 16;

/// A CEOS file in a compact form: the first theFirstKept bytes of its first record and theKept of
/// each other one, theRecords records at most.
Bytes compactCeos(const Bytes& theFile, std::size_t theRecords, std::size_t theFirstKept, std::size_t theKept);
/// Writes a compact CEOS file (as compactCeos makes it) to thePath: each record at its place by its
/// own length field, the bytes not kept a hole. A length below 12 or above CEOS_MAX_RECORD ends the
/// expansion and the rest is written as it is; theRecords records at most.
void writeCeosRecords(const std::filesystem::path& thePath, const uint8_t* theData, std::size_t theSize,
                      std::size_t theFirstKept, std::size_t theKept, std::size_t theRecords);

/// Writes a seed: theHead, then theFile (whole, whichever worker wrote it).
void writeSeed(const std::filesystem::path& theDir, const std::string& theName, const Bytes& theHead, const Bytes& theFile);

/// What an import does short of writing, with every product checked: the archives of theInput
/// (one per ALOS image file), each one's records scanned, its lines planned, the plan cut to the
/// records theFirst (modulo the records + 1) on, theCount of them (0: no cut), each product
/// described and named. A broken invariant is a fault.
void importShortOfWriting(const std::filesystem::path& theInput, const CNativeOutsideFiles& theOutside, uint8_t theFirst,
                          uint8_t theCount);

/// Runs theImport: a CImportFailure ends it cleanly (QORVEX_FUZZ_VERBOSE set: said on stderr), any
/// other failure or exception is a fault.
void runImport(const std::function<void()>& theImport);

}  // namespace qfuzz
