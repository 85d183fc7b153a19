// Shared set-up of the fuzz harnesses: a scratch directory in memory, a keys directory holding the
// delivered key files and the store's test sections, and the rule that a reported failure id is a
// clean end of an input (QORV_FATAL throws while no run is initialised).
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

namespace qfuzz {

/// A directory of this process for the files an input is written to (in /dev/shm when it exists).
const std::string& scratchDir();
/// Writes the input bytes to a file of the scratch directory; returns its path.
std::string writeInput(const std::string& theName, const uint8_t* theData, std::size_t theSize);
/// Sets up a run's settings (without catalogues, trace or log) whose key directory holds every
/// delivered key file plus "StoreTest" and "StoreSecond" (every structure and type); done once.
void setUpRun();
/// A fault of the code under test: says what broke on stderr and aborts, so that libFuzzer keeps the input.
[[noreturn]] void fault(const std::string& theWhat);

}  // namespace qfuzz

/// Runs a statement; a failure reported through QORV_FATAL ends it cleanly.
#define QFUZZ_CLEAN_FAILURES(statement)             \
    do {                                            \
        try {                                       \
            statement;                              \
        } catch (const CErrorExceptionManager&) {   \
        }                                           \
    } while (0)
