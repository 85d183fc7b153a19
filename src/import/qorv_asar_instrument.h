// The ASAR instrument file (ASA_INS_AX): an ENVISAT-format product whose one data set holds the
// instrument's characterisation. The import takes from it the radar frequency, the sampling rate,
// the range gate bias, the FBAQ decoding tables and the image mode timeline (which gives the rank,
// the pulses in flight, of each beam set).
//
// The main product header's SENSING_START and SENSING_STOP give the period the file applies to.
// Offsets within the data set (it starts behind the main and specific product headers,
// 1247 + SPH_SIZE, and is NQORV_ASAR::INSTRUMENT_FILE_SIZE bytes long); all big-endian:
//   16      float radar frequency, Hz
//   20      float sampling rate, Hz
//   69912   float range gate bias, s
//   74656   4096 floats: FBAQ 8:4 table of I
//   103328  4096 floats: FBAQ 8:4 table of Q
//   161594  image mode timeline: 4 x 7 u16, the swath, m, r and g values of the beam sets IS1 .. IS7
//           in that order (r is the rank)
#pragma once

#include <array>
#include <cstdint>
#include <filesystem>

#include "qorv_native_archive.h"

struct CAsarInstrument {
    std::filesystem::path mFile;
    double mRadarFrequency = 0.0;      // Hz
    double mSamplingRate = 0.0;        // Hz
    double mRangeGateBias = 0.0;       // s
    CFbaqTables mFbaq;
    std::array<int, 7> mRank{};        // of the beam sets IS1 .. IS7
    double mValidityStart = NAN;       // the product's SENSING_START and _STOP: when it applies, s from theReferenceDay
    double mValidityStop = NAN;
};

/// True when theFile is an ASAR instrument file by its content (its main product header names an
/// ASA_INS_AX product).
bool fqorvIsAsarInstrumentFile(const std::filesystem::path& theFile);

/// Reads an instrument file, its times counted from the midnight of theReferenceDay. CImportFailure
/// 261122 when it does not exist, 979213 when it is not an ASA_INS_AX product, its headers can't
/// be read, its data set is not NQORV_ASAR::INSTRUMENT_FILE_SIZE bytes (the file ends there), or a
/// value it gives is impossible (a frequency outside C band, 4 .. 8 GHz, a sampling rate outside
/// 1 .. 100 MHz, a range gate bias of 100 us or more, a table value not finite, a rank outside
/// 1 .. 15).
CAsarInstrument fqorvReadAsarInstrument(const std::filesystem::path& theFile, long theReferenceDay);
