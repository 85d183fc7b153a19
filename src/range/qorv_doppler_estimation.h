// Doppler centroid estimation from the phase of the lag-one correlation between neighbouring
// lines, in narrow range parts: smoothed, unwrapped, fitted in azimuth per part and in slant range
// per azimuth position, and stored as the Doppler table of the data's header.
#pragma once

#include <string>
#include <vector>

#include "qorv_complex.h"

/// -9999.0 marks "no value" in every table of the estimator (compared exactly).
inline constexpr double CQORV_DOPPLER_NO_VALUE = -9999.0;

/// A table of rows x parts entries, row-major.
template <typename T>
struct CDopplerGrid {
    int mRows = 0;
    int mParts = 0;
    std::vector<T> mData;
    CDopplerGrid(int theRows, int theParts, T theValue)
        : mRows(theRows), mParts(theParts), mData(static_cast<std::size_t>(theRows) * theParts, theValue)
    {
    }
    T& at(int r, int p) { return mData[static_cast<std::size_t>(r) * mParts + p]; }
    const T& at(int r, int p) const { return mData[static_cast<std::size_t>(r) * mParts + p]; }
};

/// The lag-one correlations of one line pair per part: theCurrent times the conjugate of
/// thePrevious, averaged over the part's pixels whose four components differ from theNull; a part
/// with theWidth / 2 or fewer such pixels gets (-9999, -9999).
void fqorvDopplerCorrelateLines(const dcomplex* thePrevious, const dcomplex* theCurrent, int theWidth, int theParts,
                                double theNull, dcomplex* theRow);

/// From the correlation table (one row per line pair) to the Doppler centroid table in Hz (one
/// row per line pair, one column per part; gDummyDouble where there is none): azimuth mean filter
/// of 15 rows, mean phase drift, unwrapping across parts and rows, whole turns, median filter of
/// 15 rows, conversion by thePrf / (2 pi).
CDopplerGrid<double> fqorvDopplerFromCorrelation(const CDopplerGrid<dcomplex>& theCorrelation, double thePrf);

/// The Doppler table: theAzRows rows (fewer where a position has too few parts), each the day,
/// the seconds of day and the theRgDegree + 1 coefficients (lowest first) of the centroid in
/// slant range (m), from per-part polynomials of theAzDegree in the row number.
std::vector<std::vector<double>> fqorvDopplerRangeTable(const CDopplerGrid<double>& theDoppler, int thePartWidth,
                                                        int theAzDegree, int theRgDegree, int theAzRows, double theNearRange,
                                                        double theSpacing, double thePrf, int theStartDay,
                                                        double theStartSeconds);

/// The estimator over the raster aPath (header aPath + "_hdr", which it updates with the I/Q
/// offsets and the table). True on success. False, with the header untouched and the cause in
/// theReason, when the data give no table row: no echo energy, too few lines for the filters, or
/// no range part whose azimuth polynomial can be fitted.
bool fdfEstimateDoppler(const char* aPath, int aAzDegree, int aRgDegree, int aNbrAzRows, bool aExtended,
                        std::string* theReason = nullptr);
