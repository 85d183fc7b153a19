#include "qorv_irf_report.h"

#include <algorithm>
#include <cmath>
#include <cstdarg>
#include <cstdio>

namespace {

std::string format(const char* theFormat, ...) __attribute__((format(printf, 1, 2)));

std::string format(const char* theFormat, ...)
{
    char aBuffer[512];
    va_list aArgs;
    va_start(aArgs, theFormat);
    std::vsnprintf(aBuffer, sizeof aBuffer, theFormat, aArgs);
    va_end(aArgs);
    return aBuffer;
}

/// The three figures of a cut, as the table prints them.
std::string cutColumns(const CIrfCut& theCut)
{
    if (!theCut.mValid) return format("%8s %8s %8s", "-", "-", "-");
    return format("%8.3f %8.2f %8.2f", theCut.mIrw, theCut.mPslrDb, theCut.mIslrDb);
}

CJson cutJson(const CIrfCut& theCut)
{
    CJson j = CJson::object();
    j["valid"] = theCut.mValid;
    j["irw"] = theCut.mIrw;
    j["pslr_db"] = std::isfinite(theCut.mPslrDb) ? CJson(theCut.mPslrDb) : CJson();
    j["islr_db"] = std::isfinite(theCut.mIslrDb) ? CJson(theCut.mIslrDb) : CJson();
    j["first_minima"] = CJson(std::vector<double>{theCut.mMinimumLeft, theCut.mMinimumRight});
    j["sidelobe_extent"] = theCut.mSidelobeExtent;
    j["clipped"] = theCut.mClipped;
    return j;
}

bool measured(const CIrfTargetResult& r) { return r.mResponse.mFound; }

}  // namespace

void fqorvIrfCompare(CIrfTargetResult& theResult)
{
    const CIrfResponse& r = theResult.mResponse;
    theResult.mLineError = r.mLine - theResult.mTarget.mLine;
    theResult.mPixelError = r.mPixel - theResult.mTarget.mPixel;
    if (theResult.mTarget.mHasPhase) {
        double d = std::remainder(r.mPhaseDeg - theResult.mTarget.mPhaseDeg, 360.0);
        if (d <= -180.0) d += 360.0;
        theResult.mPhaseErrorDeg = d;
    }
}

CIrfSummary fqorvIrfSummarise(const CIrfReport& theReport)
{
    CIrfSummary s;
    s.mWorstRangePslr = s.mWorstRangeIslr = s.mWorstAzimuthPslr = s.mWorstAzimuthIslr = -HUGE_VAL;
    double aLine2 = 0.0;
    double aPixel2 = 0.0;
    for (const CIrfTargetResult& t : theReport.mTargets) {
        if (!measured(t)) {
            ++s.mFailed;
            continue;
        }
        ++s.mMeasured;
        const CIrfResponse& r = t.mResponse;
        aLine2 += t.mLineError * t.mLineError;
        aPixel2 += t.mPixelError * t.mPixelError;
        s.mMaxLineError = std::max(s.mMaxLineError, std::fabs(t.mLineError));
        s.mMaxPixelError = std::max(s.mMaxPixelError, std::fabs(t.mPixelError));
        s.mMeanRangeIrw += r.mRange.mIrw;
        s.mMeanAzimuthIrw += r.mAzimuth.mIrw;
        s.mMaxRangeIrw = std::max(s.mMaxRangeIrw, r.mRange.mIrw);
        s.mMaxAzimuthIrw = std::max(s.mMaxAzimuthIrw, r.mAzimuth.mIrw);
        s.mWorstRangePslr = std::max(s.mWorstRangePslr, r.mRange.mPslrDb);
        s.mWorstRangeIslr = std::max(s.mWorstRangeIslr, r.mRange.mIslrDb);
        s.mWorstAzimuthPslr = std::max(s.mWorstAzimuthPslr, r.mAzimuth.mPslrDb);
        s.mWorstAzimuthIslr = std::max(s.mWorstAzimuthIslr, r.mAzimuth.mIslrDb);
    }
    if (s.mMeasured > 0) {
        s.mRmsLineError = std::sqrt(aLine2 / s.mMeasured);
        s.mRmsPixelError = std::sqrt(aPixel2 / s.mMeasured);
        s.mMeanRangeIrw /= s.mMeasured;
        s.mMeanAzimuthIrw /= s.mMeasured;
    }
    return s;
}

std::string fqorvIrfFormatTable(const CIrfReport& theReport)
{
    std::string t;
    t += format("point targets of %s (%d lines x %d pixels), truth %s\n", theReport.mSlc.c_str(),
                theReport.mImageLines, theReport.mImagePixels, theReport.mTruthPath.c_str());
    t += format("widths in samples (range) and lines (azimuth) at half power; PSLR and ISLR in dB, "
                "sidelobes within %.0f widths\n\n", theReport.mOptions.mSidelobeWidths);
    t += format("%-8s %10s %10s %10s %10s %7s %7s %7s | %8s %8s %8s | %8s %8s %8s | %s\n", "id", "exp.line",
                "exp.pixel", "line", "pixel", "dline", "dpixel", "dphase", "rg.IRW", "rg.PSLR", "rg.ISLR", "az.IRW",
                "az.PSLR", "az.ISLR", "note");
    for (const CIrfTargetResult& r : theReport.mTargets) {
        const CIrfResponse& s = r.mResponse;
        std::string aNote = s.mNote;
        if (s.mTouchesEdge) aNote += aNote.empty() ? "window crosses the image edge" : "; window crosses the image edge";
        if (!s.mFound) {
            t += format("%-8s %10.3f %10.3f %10s %10s %7s %7s %7s | %s | %s | %s\n", r.mTarget.mId.c_str(),
                        r.mTarget.mLine, r.mTarget.mPixel, "-", "-", "-", "-", "-", cutColumns(s.mRange).c_str(),
                        cutColumns(s.mAzimuth).c_str(), aNote.c_str());
            continue;
        }
        const std::string aPhase = r.mTarget.mHasPhase ? format("%7.1f", r.mPhaseErrorDeg) : format("%7s", "-");
        t += format("%-8s %10.3f %10.3f %10.3f %10.3f %7.3f %7.3f %s | %s | %s | %s\n", r.mTarget.mId.c_str(),
                    r.mTarget.mLine, r.mTarget.mPixel, s.mLine, s.mPixel, r.mLineError, r.mPixelError,
                    aPhase.c_str(), cutColumns(s.mRange).c_str(), cutColumns(s.mAzimuth).c_str(), aNote.c_str());
    }
    const CIrfIdeal& i = theReport.mIdeal;
    t += format("%-8s %10s %10s %10s %10s %7s %7s %7s | %s | %s |\n", "ideal", "", "", "", "", "", "", "",
                cutColumns(i.mRange).c_str(), cutColumns(i.mAzimuth).c_str());

    const CIrfSummary s = fqorvIrfSummarise(theReport);
    t += format("\nmeasured %d of %d targets", s.mMeasured, s.mMeasured + s.mFailed);
    if (s.mMeasured == 0) return t + "\n";
    t += format("; position error rms %.3f lines %.3f pixels, max %.3f lines %.3f pixels\n", s.mRmsLineError,
                s.mRmsPixelError, s.mMaxLineError, s.mMaxPixelError);
    auto aRatio = [](double m, double theIdeal) { return theIdeal > 0.0 ? 100.0 * (m / theIdeal - 1.0) : 0.0; };
    t += format("range:   IRW mean %.3f max %.3f samples (ideal %.3f, mean %+.1f %%), highest PSLR %.2f dB "
                "(ideal %.2f), highest ISLR %.2f dB (ideal %.2f)\n",
                s.mMeanRangeIrw, s.mMaxRangeIrw, i.mRange.mIrw, aRatio(s.mMeanRangeIrw, i.mRange.mIrw),
                s.mWorstRangePslr, i.mRange.mPslrDb, s.mWorstRangeIslr, i.mRange.mIslrDb);
    t += format("azimuth: IRW mean %.3f max %.3f lines   (ideal %.3f, mean %+.1f %%), highest PSLR %.2f dB "
                "(ideal %.2f), highest ISLR %.2f dB (ideal %.2f)\n",
                s.mMeanAzimuthIrw, s.mMaxAzimuthIrw, i.mAzimuth.mIrw, aRatio(s.mMeanAzimuthIrw, i.mAzimuth.mIrw),
                s.mWorstAzimuthPslr, i.mAzimuth.mPslrDb, s.mWorstAzimuthIslr, i.mAzimuth.mIslrDb);
    t += format("ideal:   range %s; azimuth Kaiser 2.12 over %.2f PRF",
                i.mRangeModel == "chirp" ? "chirp compressed with its Kaiser 2.12 weighted replica"
                                         : "Kaiser 2.12 over the chirp bandwidth",
                i.mAzFraction);
    if (i.mPatternVelocity > 0.0)
        t += format(" x antenna pattern (%.2f m, V %.2f m/s, %s)", theReport.mTruth.mAntennaLength,
                    i.mPatternVelocity, i.mVelocitySource.c_str());
    return t + "\n";
}

CJson fqorvIrfReportJson(const CIrfReport& theReport)
{
    CJson j = CJson::object();
    j["slc"] = theReport.mSlc;
    j["truth"] = theReport.mTruthPath;
    j["image"] = CJson(std::vector<double>{static_cast<double>(theReport.mImageLines),
                                           static_cast<double>(theReport.mImagePixels)});
    CJson& o = j["options"] = CJson::object();
    o["window"] = theReport.mOptions.mWindow;
    o["upsample"] = theReport.mOptions.mUpsample;
    o["search"] = theReport.mOptions.mSearch;
    o["sidelobe_widths"] = theReport.mOptions.mSidelobeWidths;
    o["az_fraction"] = theReport.mIdeal.mAzFraction;

    const CIrfIdeal& i = theReport.mIdeal;
    CJson& aIdeal = j["ideal"] = CJson::object();
    aIdeal["range"] = cutJson(i.mRange);
    aIdeal["azimuth"] = cutJson(i.mAzimuth);
    aIdeal["range_model"] = i.mRangeModel;
    aIdeal["pattern_velocity"] = i.mPatternVelocity;
    aIdeal["velocity_source"] = i.mVelocitySource;

    CJson& aTargets = j["targets"] = CJson::array();
    for (const CIrfTargetResult& r : theReport.mTargets) {
        const CIrfResponse& s = r.mResponse;
        CJson t = CJson::object();
        t["id"] = r.mTarget.mId;
        t["expected_line"] = r.mTarget.mLine;
        t["expected_pixel"] = r.mTarget.mPixel;
        t["found"] = s.mFound;
        t["note"] = s.mNote;
        t["touches_edge"] = s.mTouchesEdge;
        if (s.mFound) {
            t["measured_line"] = s.mLine;
            t["measured_pixel"] = s.mPixel;
            t["line_error"] = r.mLineError;
            t["pixel_error"] = r.mPixelError;
            t["peak_amplitude"] = s.mAmplitude;
            t["peak_phase_deg"] = s.mPhaseDeg;
            if (r.mTarget.mHasPhase) t["phase_error_deg"] = r.mPhaseErrorDeg;
            t["azimuth_centre_hz"] = s.mAzimuthCentre * theReport.mTruth.mPrf;
            t["range_centre_hz"] = s.mRangeCentre * theReport.mTruth.mSamplingRate;
        }
        t["range"] = cutJson(s.mRange);
        t["azimuth"] = cutJson(s.mAzimuth);
        aTargets.push(t);
    }

    const CIrfSummary s = fqorvIrfSummarise(theReport);
    CJson& m = j["summary"] = CJson::object();
    m["measured"] = s.mMeasured;
    m["failed"] = s.mFailed;
    if (s.mMeasured > 0) {
        m["rms_line_error"] = s.mRmsLineError;
        m["rms_pixel_error"] = s.mRmsPixelError;
        m["max_line_error"] = s.mMaxLineError;
        m["max_pixel_error"] = s.mMaxPixelError;
        m["mean_range_irw"] = s.mMeanRangeIrw;
        m["max_range_irw"] = s.mMaxRangeIrw;
        m["mean_azimuth_irw"] = s.mMeanAzimuthIrw;
        m["max_azimuth_irw"] = s.mMaxAzimuthIrw;
        m["worst_range_pslr_db"] = s.mWorstRangePslr;
        m["worst_range_islr_db"] = s.mWorstRangeIslr;
        m["worst_azimuth_pslr_db"] = s.mWorstAzimuthPslr;
        m["worst_azimuth_islr_db"] = s.mWorstAzimuthIslr;
    }
    return j;
}
