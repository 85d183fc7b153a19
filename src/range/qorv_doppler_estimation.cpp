// The Doppler centroid estimator. Stages: set-up, I/Q offsets, lag-one correlation, then the
// table work of fqorvDopplerFromCorrelation and fqorvDopplerRangeTable, and the header.
#include "qorv_doppler_estimation.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <memory>
#include <string>

#include "qorv_description_section.h"
#include "qorv_enviroment.h"
#include "qorv_errors.h"
#include "qorv_generic_utility.h"
#include "qorv_polynomial_utility.h"
#include "qorv_progress.h"
#include "qorv_raster_file.h"
#include "qorv_read_write_info.h"
#include "tools_raster_file_exp.h"

namespace {

constexpr double NV = CQORV_DOPPLER_NO_VALUE;
constexpr int CQORV_CORRELATION_HALF_FILTER = 7;  // 15 rows
constexpr int CQORV_OFFSET_LINES = 10000;
constexpr int CQORV_MAX_PART_WIDTH = 49;
constexpr int CQORV_MIN_LINES = 32;  // the median filter of stage 8 leaves no row below it

bool fValid(const dcomplex& z) { return z.real() != NV && z.imag() != NV; }

/// Brings an angle step back into (-pi, pi] by one turn.
double fFold(double d) { return d > M_PI ? d - 2.0 * M_PI : (d < -M_PI ? d + 2.0 * M_PI : d); }

void fPercent(int& thePercent, int theNew)
{
    if (theNew == thePercent) return;
    if (!getAndSetPerc(thePercent, theNew, nullptr)) {
        fdfTrace("\n EXECUTION INTERRUPTED BY OPERATOR\n");
        QORV_FATAL(CQORV_ERR_OPERATOR_STOP, "");
    }
    thePercent = theNew;
}

/// Stage 4: mean of the valid entries of 15 rows, when more than 7 are valid.
CDopplerGrid<dcomplex> fFilterCorrelation(const CDopplerGrid<dcomplex>& c)
{
    const int h = CQORV_CORRELATION_HALF_FILTER;
    CDopplerGrid<dcomplex> f(c.mRows, c.mParts, dcomplex(NV, NV));
    for (int r = h; r < c.mRows + 1 - 8; ++r)
        for (int p = 0; p < c.mParts; ++p) {
            dcomplex aSum(0.0, 0.0);
            int n = 0;
            for (int k = r - h; k <= r + h; ++k)
                if (k < c.mRows && fValid(c.at(k, p))) {
                    aSum += c.at(k, p);
                    ++n;
                }
            if (n > h) f.at(r, p) = aSum / static_cast<double>(n);
        }
    return f;
}

/// Stage 5: the mean phase step per line over parts 2 to 12.
double fMeanSlope(const CDopplerGrid<dcomplex>& f)
{
    double aSum = 0.0;
    long n = 0;
    for (int p = 2; p <= 12 && p < f.mParts; ++p)
        for (int r = 2; r <= f.mRows + 1 - 3 && r < f.mRows; ++r) {
            const dcomplex a = f.at(r - 1, p), b = f.at(r, p);
            if (!fValid(a) || !fValid(b)) continue;
            aSum += fFold(std::atan2(b.imag() * a.real() - b.real() * a.imag(), b.imag() * a.imag() + b.real() * a.real()));
            ++n;
        }
    return n > 0 ? aSum / static_cast<double>(n) : 0.0;
}

/// Stage 6: phases unwrapped across the parts against the row's mean so far, then against the
/// previous row's mean, with the mean drift taken out.
CDopplerGrid<double> fUnwrap(const CDopplerGrid<dcomplex>& f, double theSlope)
{
    CDopplerGrid<double> aPhase(f.mRows, f.mParts, NV);
    bool aHavePrev = false;
    double aPrevMean = 0.0;
    for (int r = 0; r < f.mRows; ++r) {
        const double aDrift = r * theSlope;
        double aSum = 0.0;
        int n = 0;
        for (int p = 0; p < f.mParts; ++p) {
            const dcomplex z = f.at(r, p);
            if (!fValid(z)) continue;
            double ph = std::atan2(z.imag(), z.real()) - aDrift;
            if (n > 0) {
                const double d = ph - aSum / n;
                if (std::fabs(d) > M_PI) ph += d > 0.0 ? -2.0 * M_PI : 2.0 * M_PI;
            }
            if (aHavePrev) {
                const double d = ph - aPrevMean;
                if (std::fabs(d) > M_PI) ph += d > 0.0 ? -2.0 * M_PI : 2.0 * M_PI;
            }
            aSum += ph;
            ++n;
            aPhase.at(r, p) = ph + aDrift;
        }
        if (n > 0) {
            aPrevMean = aSum / n;
            aHavePrev = true;
        }
    }
    return aPhase;
}

/// Mean of the valid phases of rows theRow - 5 .. theRow + 5 and parts 2 .. 13.
double fBandMean(const CDopplerGrid<double>& g, int theRow)
{
    double aSum = 0.0;
    int n = 0;
    for (int r = std::max(0, theRow - 5); r <= theRow + 5 && r < g.mRows; ++r)
        for (int p = 2; p <= 13 && p < g.mParts; ++p)
            if (g.at(r, p) != NV) {
                aSum += g.at(r, p);
                ++n;
            }
    return n > 0 ? aSum / n : 0.0;
}

/// Stage 7: whole turns beyond one, measured at the middle of the image, are taken out.
void fRemoveTurns(CDopplerGrid<double>& g, int theLines)
{
    const int q1 = theLines / 4, q3 = 3 * q1;
    const double aUp = fBandMean(g, q1), aDown = fBandMean(g, q3);
    fdfTrace("\taDopplerUp %f\t at line %d\tand col %d\n\taDopplerDw %f\t at line %d\tand col %d\n", aUp, q1, 7, aDown, q3, 7);
    const double aSlope = q3 > q1 ? (aDown - aUp) / (q3 - q1) : 0.0;
    const double aConst = aSlope * (q3 - q1) * 0.5 + aUp;
    fdfTrace("\tDoppler pass trought Module PRF = 0, in the half of the image\n\taSlope %f\n\taConst %f\n", aSlope, aConst);
    if (std::fabs(aConst) <= 2.0 * M_PI) return;
    const double aTurns = std::trunc(aConst / (2.0 * M_PI));
    fdfTrace("\taNumberOfPrf %f\n", aTurns);
    for (double& v : g.mData)
        if (v != NV) v -= aTurns * 2.0 * M_PI;
}

/// Stage 8: median of 15 rows, all of them valid.
CDopplerGrid<double> fMedianFilter(const CDopplerGrid<double>& g, int theLines)
{
    const int h = CQORV_CORRELATION_HALF_FILTER;
    CDopplerGrid<double> f(g.mRows, g.mParts, NV);
    double aWindow[2 * CQORV_CORRELATION_HALF_FILTER + 1];
    for (int r = 15; r < theLines - 16 && r + h < g.mRows; ++r)
        for (int p = 0; p < g.mParts; ++p) {
            int n = 0;
            for (int k = r - h; k <= r + h; ++k)
                if (g.at(k, p) != NV) aWindow[n++] = g.at(k, p);
            if (n < 2 * h + 1) continue;
            std::nth_element(aWindow, aWindow + h, aWindow + n);
            f.at(r, p) = aWindow[h];
        }
    return f;
}

/// A least-squares polynomial, empty when the samples do not determine it.
std::vector<double> fFit(const std::vector<double>& x, const std::vector<double>& y, int theDegree)
{
    if (static_cast<int>(x.size()) <= theDegree) return {};
    try {
        return fqorvPolyFit(x.data(), y.data(), theDegree, static_cast<int>(x.size()));
    } catch (const DSPMathException& e) {
        fdfTrace("\t%s\n", e.what());
        return {};
    }
}

double fHorner(const std::vector<double>& c, double x)
{
    double v = 0.0;
    for (std::size_t k = c.size(); k-- > 0;) v = v * x + c[k];
    return v;
}

}  // namespace

void fqorvDopplerCorrelateLines(const dcomplex* thePrevious, const dcomplex* theCurrent, int theWidth, int theParts,
                                double theNull, dcomplex* theRow)
{
    using NQORV_UTILITY::isNullValue;
    for (int p = 0; p < theParts; ++p) {
        dcomplex aSum(0.0, 0.0);
        int n = 0;
        for (int s = p * theWidth; s < (p + 1) * theWidth; ++s) {
            const dcomplex a = thePrevious[s], b = theCurrent[s];
            if (isNullValue(a.real(), theNull) || isNullValue(a.imag(), theNull) || isNullValue(b.real(), theNull) ||
                isNullValue(b.imag(), theNull))
                continue;
            aSum += dcomplex(b.real() * a.real() + b.imag() * a.imag(), b.imag() * a.real() - b.real() * a.imag());
            ++n;
        }
        // A correlation of exactly zero (lines without echo energy) carries no phase.
        const bool aValid = n > theWidth / 2 && (aSum.real() != 0.0 || aSum.imag() != 0.0);
        theRow[p] = aValid ? aSum / static_cast<double>(n) : dcomplex(NV, NV);
    }
}

CDopplerGrid<double> fqorvDopplerFromCorrelation(const CDopplerGrid<dcomplex>& theCorrelation, double thePrf)
{
    const int aLines = theCorrelation.mRows + 1;
    fdfTrace("\n\n CrossCorr FILTER IN AZIMUTH DIRECTION");
    const CDopplerGrid<dcomplex> aFiltered = fFilterCorrelation(theCorrelation);
    const double aSlope = fMeanSlope(aFiltered);
    fdfTrace("\taSlope %f\n", aSlope);
    fdfTrace("\n\n CrossCorr FIND PHASE DIFFERENCE");
    CDopplerGrid<double> aPhase = fUnwrap(aFiltered, aSlope);
    fRemoveTurns(aPhase, aLines);
    fdfTrace("\n\n Doppler FILTER IN AZIMUTH DIRECTION");
    CDopplerGrid<double> aDoppler = fMedianFilter(aPhase, aLines);
    fdfTrace("\n\n CONVERT DOPPLER IN Hz");
    const double aConv = thePrf * 0.5 / M_PI;
    for (double& v : aDoppler.mData) v = v != NV ? v * aConv : gDummyDouble;
    return aDoppler;
}

std::vector<std::vector<double>> fqorvDopplerRangeTable(const CDopplerGrid<double>& theDoppler, int thePartWidth,
                                                        int theAzDegree, int theRgDegree, int theAzRows, double theNearRange,
                                                        double theSpacing, double thePrf, int theStartDay,
                                                        double theStartSeconds)
{
    using NQORV_UTILITY::isNullValue;
    fdfTrace("\n\n Polynomial list for every range part\n\tPART Nr\tCol\t\tPolynomial\n");
    const int aHalfWidth = thePartWidth / 2;
    std::vector<std::vector<double>> aPartPolynomials(static_cast<std::size_t>(theDoppler.mParts));
    for (int p = 0; p < theDoppler.mParts; ++p) {
        std::vector<double> x, y;
        for (int r = 0; r < theDoppler.mRows; ++r)
            if (!isNullValue(theDoppler.at(r, p), gDummyDouble)) {
                x.push_back(r);
                y.push_back(theDoppler.at(r, p));
            }
        aPartPolynomials[static_cast<std::size_t>(p)] = fFit(x, y, theAzDegree);
        fdfTrace("\t%d\t%d", p + 1, thePartWidth * p + aHalfWidth);
        if (aPartPolynomials[static_cast<std::size_t>(p)].empty()) fdfTrace("\tNO VALID POLYNOMIAL");
        for (double c : aPartPolynomials[static_cast<std::size_t>(p)]) fdfTrace("\t%g", c);
        fdfTrace("\n");
    }

    fdfTrace("\n\n Range Polynomial list : \n\tRow\tDAY\tSECOND\tPolynomial\n");
    const int aLines = theDoppler.mRows + 1;
    const int aRowStep = theAzRows > 0 ? aLines / theAzRows : aLines;
    std::vector<std::vector<double>> aTable;
    for (int t = 0; t < theAzRows; ++t) {
        const double L = static_cast<double>(t) * aRowStep;
        std::vector<double> x, y;
        for (int p = 0; p < theDoppler.mParts; ++p) {
            if (aPartPolynomials[static_cast<std::size_t>(p)].empty()) continue;
            x.push_back(thePartWidth * p + aHalfWidth);
            y.push_back(fHorner(aPartPolynomials[static_cast<std::size_t>(p)], L));
        }
        // Median of three over range; the pairs close up by one at each end.
        const std::vector<double> aOld = y;
        const int m = static_cast<int>(x.size());
        for (int i = 1; i + 1 < m; ++i) {
            double v[3] = {aOld[i - 1], aOld[i], aOld[i + 1]};
            std::sort(v, v + 3);
            y[i - 1] = v[1];
            x[i - 1] = x[i];
        }
        if (m - 2 <= theRgDegree) continue;
        x.resize(m - 2);
        y.resize(m - 2);
        for (double& v : x) v = theSpacing * v + theNearRange;
        const std::vector<double> c = fFit(x, y, theRgDegree);
        if (c.empty()) continue;
        // Rows go by their count: a position that gives none closes the table up.
        const double aLine = static_cast<double>(aTable.size()) * aRowStep;
        double aSeconds = aLine / thePrf + theStartSeconds;
        int aDay = theStartDay;
        if (aSeconds > 86400.0) {
            aSeconds -= 86400.0;
            ++aDay;
        }
        std::vector<double> aRow = {static_cast<double>(aDay), aSeconds};
        aRow.insert(aRow.end(), c.begin(), c.end());
        fdfTrace("\t%d\t%d\t%f", static_cast<int>(aTable.size()), aDay, aSeconds);
        for (double v : c) fdfTrace("\t%g", v);
        fdfTrace("\n");
        aTable.push_back(std::move(aRow));
    }
    return aTable;
}

namespace {

/// Guarded sum: scaled down by ten when it passes 1e14, terms divided by the running divisor.
struct CGuardedSum {
    double mSum = 0.0, mDivisor = 1.0;
    void add(double v)
    {
        if (mSum > 1.0e14) {
            mSum *= 0.1;
            mDivisor *= 10.0;
        }
        mSum += v / mDivisor;
    }
    double mean(long long n) const { return mSum / static_cast<double>(n) * mDivisor; }
};

/// Stage 2: the I/Q offsets and the imbalance of integer samples over the first 10,000 lines,
/// stored as user keys. False when no visited line varies: the echoes carry no energy.
bool fOffsets(CDescriptionHeader& h, CRasterFile& f, int theLines, double& theI, double& theQ, double& theImbalance,
              int& thePercent)
{
    theI = theQ = 0.0;
    theImbalance = 1.0;
    fdfTrace("\n\n CrossCorr ESTIMATION");
    const int aType = f.getCellType();
    if (aType == CQORV_CELL_FLOAT_COMPLEX || aType == CQORV_CELL_FLOAT) return true;
    const int aCount = std::min(theLines, CQORV_OFFSET_LINES);
    std::vector<dcomplex> aLine(static_cast<std::size_t>(f.getNrOfPixels()));
    CGuardedSum sI, sQ, sI2, sQ2;
    long long n = 0, aNoNull = 0;
    for (int i = 0; i < aCount; ++i) {
        fPercent(thePercent, 1 + 50 * i / aCount);
        fqorvReadLine(f, aLine.data(), i);
        bool aNull = true;
        for (const dcomplex& z : aLine)
            if (!NQORV_UTILITY::isNullValue(z.real(), aLine[0].real()) || !NQORV_UTILITY::isNullValue(z.imag(), aLine[0].imag())) {
                aNull = false;
                break;
            }
        if (aNull) continue;
        ++aNoNull;
        for (const dcomplex& z : aLine) {
            sI.add(z.real());
            sQ.add(z.imag());
            sI2.add(z.real() * z.real());
            sQ2.add(z.imag() * z.imag());
            ++n;
        }
    }
    if (n > 0) {
        theI = sI.mean(n);
        theQ = sQ.mean(n);
        const double aVarQ = sQ2.mean(n) - theQ * theQ;
        theImbalance = aVarQ > 0.0 ? std::sqrt(std::max(sI2.mean(n) - theI * theI, 0.0)) / std::sqrt(aVarQ) : 1.0;
    }
    fdfTrace("aNoNullPoints : %lld\nnumber of sample points in DC bias sum: %lld\n", aNoNull, n);
    fdfTrace("I channel offset:      %f\nQ channel offset:      %f\nI/Q channel inbalance: %f\n", theI, theQ, theImbalance);
    for (const auto& [aKey, aValue] : {std::pair{"OTHER_INFO_I_ESTIMATION", theI}, std::pair{"OTHER_INFO_Q_ESTIMATION", theQ},
                                       std::pair{"OTHER_INFO_IQ_INBALANCE_ESTIMATION", theImbalance}})
        fqorvSetUserKey(h, aKey, fqorvStringFormat("%lf", aValue).c_str());
    return n > 0;
}

/// Stage 3: the correlation of every line pair, per part.
CDopplerGrid<dcomplex> fCorrelate(CRasterFile& f, int theLines, int thePartWidth, int theParts, double theNull, double theI,
                                  double theQ, double theImbalance, int& thePercent)
{
    CDopplerGrid<dcomplex> c(std::max(theLines - 1, 0), theParts, dcomplex(NV, NV));
    std::vector<dcomplex> aPrevious(static_cast<std::size_t>(f.getNrOfPixels())), aCurrent(aPrevious.size());
    auto aRead = [&](int theLine, std::vector<dcomplex>& theBuffer) {
        fqorvReadLine(f, theBuffer.data(), theLine);
        for (dcomplex& z : theBuffer) z = dcomplex(z.real() - theI, (z.imag() - theQ) * theImbalance);
    };
    if (theLines < 2) return c;
    aRead(0, aPrevious);
    for (int i = 1; i < theLines; ++i) {
        fPercent(thePercent, static_cast<int>(100LL * i / theLines));
        aRead(i, aCurrent);
        fqorvDopplerCorrelateLines(aPrevious.data(), aCurrent.data(), thePartWidth, theParts, theNull, &c.at(i - 1, 0));
        std::swap(aPrevious, aCurrent);
    }
    return c;
}

}  // namespace

bool fdfEstimateDoppler(const char* aPath, int aAzDegree, int aRgDegree, int aNbrAzRows, bool aExtended,
                        std::string* theReason)
{
    // No estimate leaves the header as it was, so that the Doppler it held still serves a run
    // that skips this step.
    auto aFail = [&](const std::string& theText) {
        fdfTrace("\nNo Doppler centroid estimate: %s\n", theText.c_str());
        if (theReason) *theReason = theText;
        return false;
    };
    getAndSetPerc(-1, 0, "Doppler Estimation");
    int aPercent = 0;
    fdfTrace("\nDoppler Estimation of : %s", aPath);
    const std::string aHeaderName = std::string(aPath) + "_hdr";
    std::unique_ptr<CDescriptionHeader> aHeader = CDescriptionHeader::makeFull();
    if (!aHeader->read(aHeaderName.c_str(), false)) {
        fdfTrace("Error: missing parameter file %s\n", aHeaderName.c_str());
        QORV_FATAL(CQORV_ERR_MISSING_FILE, aHeaderName.c_str());
    }
    CDescriptionHeader& h = *aHeader;
    const int aPixels = h["RasterInfo.NrOfPixelsPerLine"].getInteger();
    const int aLines = h["RasterInfo.NrOfLinesPerImage"].getInteger();
    const int aPartWidth = std::min(aPixels, CQORV_MAX_PART_WIDTH);
    const int aParts = aPixels / aPartWidth;
    const double aPrf = h["ChannelInfo.PRF"].getDouble(0);
    fdfTrace("\nSize of a Range splitted part = %d", aPartWidth);
    fdfTrace("\nNumber of parts to split the range (to take into account range variability) = %d", aParts);
    fdfTrace("\nConversion Factor to obtain Doppler in Hertz = %f", aPrf * 0.5 / M_PI);
    fdfTrace("\nFilte Size in Azimuth direction = %d\n", 2 * CQORV_CORRELATION_HALF_FILTER + 1);
    const double r0 = h["Processing.SlantRange"].getDouble(0);
    const double dr = h["Processing.PixelSpacingRg"].getDouble();
    YDF_SAR aSar;
    read_image_info(aPath, aSar);
    const CDescriptionField* aNullField = h.findField("RasterInfo.NullCellValue");
    const double aNull = aNullField && aNullField->isInitialised() ? aNullField->getDouble() : -9999.0;

    CRasterFileParam aParam;
    fqorvRasterParamFromHeader(h, aPath, aParam);
    CRasterFile f;
    f.openRead(aParam);
    double aI = 0.0, aQ = 0.0, aImbalance = 1.0;
    if (!fOffsets(h, f, aLines, aI, aQ, aImbalance, aPercent))
        return aFail("every echo line is constant: the raw data carry no energy");
    const CDopplerGrid<dcomplex> aCorrelation = fCorrelate(f, aLines, aPartWidth, aParts, aNull, aI, aQ, aImbalance, aPercent);
    f.close();
    if (std::all_of(aCorrelation.mData.begin(), aCorrelation.mData.end(), [](const dcomplex& z) { return z.real() == NV; }))
        return aFail("no pair of neighbouring lines correlates: the data carry no energy");
    const CDopplerGrid<double> aDoppler = fqorvDopplerFromCorrelation(aCorrelation, aPrf);
    if (aExtended) fdfTrace("\nthe Doppler raster of the extended estimate is not written by this build\n");
    const std::vector<std::vector<double>> aTable = fqorvDopplerRangeTable(
        aDoppler, aPartWidth, aAzDegree, aRgDegree, aNbrAzRows, r0, dr, aPrf, aSar.mStartDay, aSar.time_start);

    if (aTable.empty()) {
        if (aLines < CQORV_MIN_LINES)
            return aFail(fqorvStringFormat("%d lines are too few: the azimuth filters need %d", aLines,
                                           CQORV_MIN_LINES));
        return aFail(fqorvStringFormat("no range part gave an azimuth polynomial of degree %d", aAzDegree));
    }

    fdfTrace("\tWRITE IN HEADER FILE NEW DOPPLER POLYNOMIAL\n");
    const int R = static_cast<int>(aTable.size());
    CDescriptionField& aCounts = h["Processing.DopCenPol_nCoeff"];
    CDescriptionField& aCoeff = h["Processing.DopCenRangeCoeff"];
    aCounts.resize(1, R);
    aCoeff.resize(R, aRgDegree + 3);
    for (int i = 0; i < R; ++i) {
        aCounts.setValue(i, aRgDegree + 3);
        for (int k = 0; k < aRgDegree + 3; ++k) aCoeff.setValue(i, k, aTable[static_cast<std::size_t>(i)][static_cast<std::size_t>(k)]);
    }
    h["Processing.DopplerEstimatedFlag"].setValue("OK");
    if (!h.write(aHeaderName.c_str(), false, false)) {
        fdfTrace("Error while writing parameter file %s\n", aHeaderName.c_str());
        QORV_FATAL(CQORV_ERR_CREATE_FILE, aHeaderName.c_str());
    }
    return true;
}
