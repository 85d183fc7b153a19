#include "qorv_raw_product_writer.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <system_error>
#include <vector>

#include "qorv_date.h"
#include "qorv_description_section.h"
#include "qorv_generic_utility.h"
#include "qorv_import_failure.h"
#include "qorv_orbit_utility.h"

namespace {

namespace fs = std::filesystem;

/// Lines assembled and written together: enough to make the system calls cheap, few enough that the
/// buffer stays in memory the process has touched (new memory costs more than the copy here).
constexpr std::size_t CQORV_WRITE_CHUNK_BYTES = 1u << 20;

void putBE32(uint8_t* p, uint32_t v)
{
    p[0] = static_cast<uint8_t>(v >> 24);
    p[1] = static_cast<uint8_t>(v >> 16);
    p[2] = static_cast<uint8_t>(v >> 8);
    p[3] = static_cast<uint8_t>(v);
}

void putBE16(uint8_t* p, uint16_t v)
{
    p[0] = static_cast<uint8_t>(v >> 8);
    p[1] = static_cast<uint8_t>(v);
}

// ------------------------------------------------------------------------------------------------
// The raster

/// Assembles a product's lines: the records read straight into their lines (the samples where
/// the product wants them), the prefixes rebuilt, the lost lines filled.
class CLineAssembler {
public:
    CLineAssembler(const CNativeArchive& theArchive, CNativeRecordFile& theRecords)
        : mLayout(theArchive.mLayout), mRecords(theRecords),
          mLineBytes(static_cast<std::size_t>(CQORV_ERS_ROW_PREFIX) + 2u * static_cast<std::size_t>(mLayout.mSamples)),
          mShift(static_cast<long>(CQORV_ERS_ROW_PREFIX) - static_cast<long>(mLayout.mSamplesPos)),
          // A record in the product's own layout (the CEOS products whose counter stands at 210)
          // keeps its whole prefix; other layouts keep their auxiliary block only.
          mOwnLayout(mShift == 0 && mLayout.mCounterPos == CQORV_ERS_COUNTER_POS)
    {
    }

    std::size_t lineBytes() const { return mLineBytes; }

    /// Writes theCount lines from theLines into theOut (theCount lineBytes()).
    void assemble(const CPlannedLine* theLines, std::size_t theCount, uint8_t* theOut)
    {
        for (std::size_t a = 0; a < theCount;) {
            std::size_t b = a + 1;
            if (theLines[a].mSource < 0) {
                fillLine(theOut + a * mLineBytes);
            } else {
                // A run of consecutive records in one read.
                while (b < theCount && theLines[b].mSource == theLines[b - 1].mSource + 1) ++b;
                mRecords.readIntoLines(static_cast<uint64_t>(theLines[a].mSource), b - a, theOut + a * mLineBytes, mLineBytes,
                                       mShift);
                if (!mOwnLayout)
                    for (std::size_t i = a; i < b; ++i) rebuildPrefix(theOut + i * mLineBytes);
            }
            a = b;
        }
        for (std::size_t i = 0; i < theCount; ++i) {
            uint8_t* p = theOut + i * mLineBytes;
            putBE32(p + CQORV_ERS_COUNTER_POS, theLines[i].mCounter);
            putBE16(p + CQORV_ERS_SWST_POS, theLines[i].mSwst);
            putBE16(p + CQORV_ERS_PRI_POS, theLines[i].mPri);
        }
    }

private:
    /// The prefix of a record of another layout: zeros, and its auxiliary block where the product
    /// keeps it (the block stands inside the prefix in every layout, so it arrived in this line).
    void rebuildPrefix(uint8_t* theLine) const
    {
        uint8_t aAux[CQORV_ERS_AUX_BYTES];
        std::memcpy(aAux, theLine + mLayout.mAuxPos + mShift, CQORV_ERS_AUX_BYTES);
        std::memset(theLine, 0, CQORV_ERS_ROW_PREFIX);
        std::memcpy(theLine + CQORV_ERS_AUX_POS, aAux, CQORV_ERS_AUX_BYTES);
    }

    /// A line the archive lost: the auxiliary block's marker and every sample at the I/Q bias
    /// (15 and 16 in turn, so that the chain's offset estimate stays at 15.5 and the line carries no
    /// signal after it).
    void fillLine(uint8_t* theOut) const
    {
        std::memset(theOut, 0, CQORV_ERS_ROW_PREFIX);
        theOut[CQORV_ERS_COUNTER_POS - 8] = NQORV_ERS::MARKER;
        for (std::size_t i = CQORV_ERS_ROW_PREFIX, k = 0; i + 1 < mLineBytes; i += 2, ++k) {
            theOut[i] = static_cast<uint8_t>(15 + (k & 1u));
            theOut[i + 1] = static_cast<uint8_t>(16 - (k & 1u));
        }
    }

    const CNativeRecordLayout& mLayout;
    CNativeRecordFile& mRecords;
    std::size_t mLineBytes;
    long mShift;      // where a record's byte 0 lands in its line
    bool mOwnLayout;
};

/// A file being written under a temporary name; removed unless committed.
class CPartFile {
public:
    explicit CPartFile(fs::path thePath) : mPath(std::move(thePath))
    {
        mFd = ::open(mPath.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
        if (mFd < 0) fqorvImportFail(CQORV_ERR_CREATE_FILE, mPath.string() + ": " + std::strerror(errno));
    }
    ~CPartFile()
    {
        if (mFd >= 0) ::close(mFd);
        if (!mCommitted) {
            std::error_code e;
            fs::remove(mPath, e);
        }
    }
    CPartFile(const CPartFile&) = delete;
    CPartFile& operator=(const CPartFile&) = delete;

    void write(const uint8_t* theData, std::size_t theBytes)
    {
        while (theBytes > 0) {
            const ssize_t n = ::write(mFd, theData, theBytes);
            if (n < 0 && errno == EINTR) continue;
            if (n <= 0) fqorvImportFail(CQORV_ERR_WRITE_FILE, mPath.string() + ": " + std::strerror(n < 0 ? errno : ENOSPC));
            theData += n;
            theBytes -= static_cast<std::size_t>(n);
        }
    }

    void commit(const fs::path& theFinal)
    {
        if (::close(mFd) != 0) {
            mFd = -1;
            fqorvImportFail(CQORV_ERR_WRITE_FILE, mPath.string() + ": " + std::strerror(errno));
        }
        mFd = -1;
        std::error_code e;
        fs::rename(mPath, theFinal, e);
        if (e) fqorvImportFail(CQORV_ERR_WRITE_FILE, "cannot rename " + mPath.string() + ": " + e.message());
        mCommitted = true;
    }

private:
    fs::path mPath;
    int mFd = -1;
    bool mCommitted = false;
};

void writeRaster(const CNativeArchive& a, CNativeRecordFile& theRecords, const CPlannedProduct& p, const fs::path& theRoot,
                 const std::function<void(int)>& theProgress)
{
    CLineAssembler aAssembler(a, theRecords);
    const std::size_t aLineBytes = aAssembler.lineBytes();
    const std::size_t aChunkLines = std::max<std::size_t>(1, CQORV_WRITE_CHUNK_BYTES / aLineBytes);
    std::vector<uint8_t> aOut(aChunkLines * aLineBytes);
    CPartFile aPart(theRoot.string() + ".part");
    const std::size_t n = p.mLines.size();
    int aPercent = -1;
    for (std::size_t aFirst = 0; aFirst < n; aFirst += aChunkLines) {
        const std::size_t aCount = std::min(aChunkLines, n - aFirst);
        aAssembler.assemble(p.mLines.data() + aFirst, aCount, aOut.data());
        aPart.write(aOut.data(), aCount * aLineBytes);
        const int aNow = static_cast<int>(100 * (aFirst + aCount) / n);
        if (theProgress && aNow != aPercent) theProgress(aNow);
        aPercent = aNow;
    }
    aPart.commit(theRoot);
}

// ------------------------------------------------------------------------------------------------
// The header

std::string dateText(long theDay, double theSeconds)
{
    CQorvDate d;
    d.set(theDay, theSeconds);
    return d.text();
}

void setVector(CDescriptionHeader& h, const char* theKey, const std::vector<double>& theValues)
{
    CDescriptionField& f = h[theKey];
    f.resize(1, static_cast<int>(theValues.size()));
    for (std::size_t i = 0; i < theValues.size(); ++i) f.setValue(static_cast<int>(i), theValues[i]);
}

void fillRadar(CDescriptionHeader& h, const CNativeArchive& a, const CProductDescription& d)
{
    CDescriptionField& aChannel = h["ChannelInfo.Description"];
    aChannel.resize(1, 1);
    aChannel.setValue(0, a.mPolarisation.c_str());
    setVector(h, "ChannelInfo.CarrierFrequency", {d.mCarrier});
    setVector(h, "ChannelInfo.SamplingRate", {d.mSamplingRate});
    setVector(h, "ChannelInfo.PulseDuration", {d.mPulseLength});
    setVector(h, "ChannelInfo.BandWidth", {d.mBandwidth});
    setVector(h, "ChannelInfo.PRF", {d.mPrf});
    setVector(h, "ChannelInfo.PRFExtracted", {d.mPrf});
    h["ChannelInfo.IncidenceAngle"].setValue(d.mIncidenceDeg);
    h["ChannelInfo.RangeLookAngle"].setValue(d.mLookDeg);

    h["Sensor.SensorName"].setValue(a.mSensor);
    h["Sensor.Spectrum"].setValue("NORMAL");
    h["Sensor.Baseband"].setValue("YES");
    h["Sensor.Chirp"].setValue(d.mChirpRate > 0.0 ? "UP_CHIRP" : "DOWN_CHIRP");
    h["Sensor.SamplingMode"].setValue("IQ");
    h["Sensor.SARMode"].setValue("STRIPMAP");
    h["Sensor.AzimuthAngle"].setValue(90.0);  // right-looking
}

void fillRaster(CDescriptionHeader& h, const CNativeArchive& a, const CPlannedProduct& p, const CProductDescription& d)
{
    h["sar_processing.FirstPixel"].setValue(0);
    h["RasterInfo.NrOfPixelsPerLine"].setValue(d.mSamples);
    h["RasterInfo.NrOfLinesPerImage"].setValue(static_cast<int>(p.mLines.size()));
    h["RasterInfo.CellType"].setValue("UBYTE_COMPLEX");
    h["RasterInfo.DataUnits"].setValue("ERS RAW");
    h["RasterInfo.BytesOrder"].setValue("MSBF");
    h["RasterInfo.HeaderOffset"].setValue(0);
    h["RasterInfo.RowPrefix"].setValue(CQORV_ERS_ROW_PREFIX);
    h["RasterInfo.RowSuffix"].setValue(0);
    h["RasterInfo.FooterLen"].setValue(0);
    h["RasterInfo.NullCellValue"].setValue(-9999.0);
    h["RasterInfo.GeocodedImage"].setValue("NotOK");
    std::error_code e;
    const fs::path aSource = fs::absolute(a.mSource, e);
    fqorvSetUserKey(h, "IMPORTED FROM", (e ? a.mSource : aSource).string().c_str());
    fqorvSetUserKey(h, "IMPORT FORMAT", (a.mFormat + ", " + a.mLayoutName).c_str());
    fqorvSetUserKey(h, "IMPORT RECORDS", (std::to_string(p.mFirstRecord) + " to " + std::to_string(p.mLastRecord)).c_str());
    fqorvSetUserKey(h, "IMPORT ORBIT", d.mOrbitSource.c_str());
}

void fillGeometry(CDescriptionHeader& h, const CNativeArchive& a, const CProductDescription& d)
{
    const double c = CQORV_LIGHT_SPEED;
    h["RegistrationCoordinates.LatNorthing"].setValue(d.mCentreLatitude);
    h["RegistrationCoordinates.LonEasting"].setValue(d.mCentreLongitude);
    h["AcquisitionParameters.AzimuthStartTime"].setValue(dateText(a.mReferenceDay, d.mStartTime));
    h["AcquisitionParameters.AzimuthStopTime"].setValue(dateText(a.mReferenceDay, d.mStopTime));

    setVector(h, "Processing.SlantRange", {d.mNearRange, d.mCentreRange, d.mFarRange});
    setVector(h, "Processing.FastTime", {2.0 * d.mNearRange / c, 2.0 * d.mCentreRange / c, 2.0 * d.mFarRange / c});
    h["Processing.PixelSpacingRg"].setValue(d.mRangeSpacing);
    h["Processing.PixelSpacingAz"].setValue(d.mAzimuthSpacing);
    h["Processing.NRangeLooks"].setValue(1);
    h["Processing.NAzimuthLooks"].setValue(1);
    setVector(h, "Processing.ProcessingVelocity", {d.mProcessingVelocity});

    h["InitialGeometry.Projection"].setValue("SLANT_RANGE");
    h["InitialGeometry.TimeDirectionLines"].setValue("INCREASE TIME DIRECTION");
    h["InitialGeometry.TimeDirectionPixel"].setValue("INCREASE TIME DIRECTION");
    h["InitialGeometry.OrbitConfiguration"].setValue(fqorvOrbitConfiguration(d.mHeadingDeg));
    h["InitialGeometry.SceneHeading"].setValue(d.mHeadingDeg);
    h["InitialGeometry.ReferenceHeight"].setValue(0.0);

    const std::vector<CStateVector>& v = d.mStateVectors;
    h["StateVectorData.nStateVectors"].setValue(static_cast<int>(v.size()));
    h["StateVectorData.StateVectorReference"].setValue("ECR");
    h["StateVectorData.TimeFirst"].setValue(dateText(a.mReferenceDay, v.front().mTime));
    h["StateVectorData.TimeDelta"].setValue(d.mStateVectorStep);
    const char* const aKeys[6] = {"StateVectorData.pos_x", "StateVectorData.pos_y", "StateVectorData.pos_z",
                                  "StateVectorData.vel_x", "StateVectorData.vel_y", "StateVectorData.vel_z"};
    for (int k = 0; k < 6; ++k) {
        std::vector<double> aValues;
        for (const CStateVector& s : v) aValues.push_back(k < 3 ? s.mPosition[k] : s.mVelocity[k - 3]);
        setVector(h, aKeys[k], aValues);
    }
}

}  // namespace

void fqorvFillRawHeader(CDescriptionHeader& theHeader, const CNativeArchive& theArchive, const CPlannedProduct& theProduct,
                        const CProductDescription& theDescription)
{
    fillRadar(theHeader, theArchive, theDescription);
    fillRaster(theHeader, theArchive, theProduct, theDescription);
    fillGeometry(theHeader, theArchive, theDescription);
}

void fqorvWriteRawProduct(const CNativeArchive& theArchive, CNativeRecordFile& theRecords, const CPlannedProduct& theProduct,
                          const CProductDescription& theDescription, const fs::path& theRoot,
                          const std::function<void(int)>& theProgress)
{
    // A product is complete when its header exists: an earlier product under this name stops
    // being one before anything of the new one is written.
    const fs::path aHeader = theRoot.string() + ".sml";
    std::error_code e;
    fs::remove(aHeader, e);
    writeRaster(theArchive, theRecords, theProduct, theRoot, theProgress);
    std::unique_ptr<CDescriptionHeader> h = CDescriptionHeader::makeFull();
    fqorvFillRawHeader(*h, theArchive, theProduct, theDescription);
    if (!h->write(theRoot.c_str(), true, false)) {
        fs::remove(theRoot, e);
        fqorvImportFail(CQORV_ERR_WRITE_FILE, aHeader.string());
    }
}
