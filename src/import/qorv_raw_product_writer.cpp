#include "qorv_raw_product_writer.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <bit>
#include <cerrno>
#include <cmath>
#include <cstring>
#include <future>
#include <memory>
#include <system_error>
#include <thread>
#include <vector>

#include "qorv_date.h"
#include "qorv_description_section.h"
#include "qorv_fbaq.h"
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

/// Where the chain reads a family's codes in a written prefix; -1: not written.
struct CPrefixFields {
    int mBytes, mCounter, mSwst, mPri, mRange;
};

CPrefixFields prefixFields(ENativeFamily theFamily)
{
    switch (theFamily) {
    case ENativeFamily::Asar: return {CQORV_ASAR_ROW_PREFIX, CQORV_ASAR_COUNTER_POS, CQORV_ASAR_SWST_POS, CQORV_ERS_PRI_POS, -1};
    case ENativeFamily::Alos: return {CQORV_ALOS_ROW_PREFIX, CQORV_ALOS_COUNTER_POS, -1, CQORV_ERS_PRI_POS, CQORV_ALOS_RANGE_POS};
    default: return {CQORV_ERS_ROW_PREFIX, CQORV_ERS_COUNTER_POS, CQORV_ERS_SWST_POS, CQORV_ERS_PRI_POS, -1};
    }
}

void putCodes(uint8_t* theLine, const CPrefixFields& f, const CPlannedLine& l)
{
    putBE32(theLine + f.mCounter, l.mCounter);
    if (f.mSwst >= 0) putBE16(theLine + f.mSwst, l.mSwst);
    putBE16(theLine + f.mPri, l.mPri);
    if (f.mRange >= 0) putBE32(theLine + f.mRange, static_cast<uint32_t>(l.mRange));
}

/// What assembles a product's lines, chunk by chunk, for the writer.
class CLineSource {
public:
    virtual ~CLineSource() = default;
    virtual std::size_t lineBytes() const = 0;
    /// Lines written together: about CQORV_WRITE_CHUNK_BYTES.
    virtual std::size_t chunkLines() const { return std::max<std::size_t>(1, CQORV_WRITE_CHUNK_BYTES / lineBytes()); }
    /// Writes theCount lines from theLines into theOut (theCount lineBytes()).
    virtual void assemble(const CPlannedLine* theLines, std::size_t theCount, uint8_t* theOut) = 0;
    /// Whether a chunk is assembled while the one before is written.
    virtual bool overlapsWriting() const { return false; }
};

/// The lines of ERS and ALOS products: the records read straight into their lines (the samples
/// where the product wants them), the prefixes rebuilt, the lost lines filled.
class CRecordLines : public CLineSource {
public:
    CRecordLines(const CNativeArchive& theArchive, CNativeRecordFile& theRecords, int theSamples)
        : mLayout(theArchive.mLayout), mRecords(theRecords), mFields(prefixFields(theArchive.mFamily)),
          mAlos(theArchive.mFamily == ENativeFamily::Alos),
          mLineBytes(static_cast<std::size_t>(mFields.mBytes) + 2u * static_cast<std::size_t>(theSamples)),
          mShift(static_cast<long>(mFields.mBytes) - static_cast<long>(mLayout.mSamplesPos)),
          // A record in the product's own layout (the CEOS products whose counter stands at 210,
          // ALOS records) keeps its whole prefix; other layouts keep their auxiliary block only.
          mOwnLayout(mShift == 0 && (mAlos || mLayout.mCounterPos == CQORV_ERS_COUNTER_POS))
    {
        makeFillLine(theArchive);
    }

    std::size_t lineBytes() const override { return mLineBytes; }

    void assemble(const CPlannedLine* theLines, std::size_t theCount, uint8_t* theOut) override
    {
        for (std::size_t a = 0; a < theCount;) {
            std::size_t b = a + 1;
            if (theLines[a].mSource < 0) {
                std::memcpy(theOut + a * mLineBytes, mFill.data(), mLineBytes);
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
        for (std::size_t i = 0; i < theCount; ++i) putCodes(theOut + i * mLineBytes, mFields, theLines[i]);
    }

private:
    /// The prefix of a record of another layout: zeros, and an ERS record's auxiliary block where
    /// the product keeps it (the block stands inside the prefix in every layout, so it arrived in
    /// this line).
    void rebuildPrefix(uint8_t* theLine) const
    {
        uint8_t aAux[CQORV_ERS_AUX_BYTES];
        if (!mAlos) std::memcpy(aAux, theLine + mLayout.mAuxPos + mShift, CQORV_ERS_AUX_BYTES);
        std::memset(theLine, 0, static_cast<std::size_t>(mFields.mBytes));
        if (!mAlos) std::memcpy(theLine + CQORV_ERS_AUX_POS, aAux, CQORV_ERS_AUX_BYTES);
    }

    /// A line the archive lost: no signal, every sample at the I/Q bias. The codes alternate
    /// around it (15 and 16 in turn for a bias of 15.5, I and Q in opposite turns), so that the
    /// chain's offset estimate stays where the echoes put it and the line carries no signal after
    /// it. ERS takes 15.5 (its leaders state the bias seldom, and wrongly: docs/importers.md); an
    /// ERS line also keeps its marker byte.
    void makeFillLine(const CNativeArchive& a)
    {
        auto aBias = [&](double theStated) {
            return mAlos && theStated >= 0.0 && theStated <= 31.0 ? theStated : NQORV_ERS::IQ_BIAS;
        };
        const double aI = aBias(a.mIBias), aQ = aBias(a.mQBias);
        mFill.assign(mLineBytes, 0);
        if (!mAlos) mFill[CQORV_ERS_COUNTER_POS - 8] = NQORV_ERS::MARKER;
        for (std::size_t i = static_cast<std::size_t>(mFields.mBytes), k = 0; i + 1 < mLineBytes; i += 2, ++k) {
            mFill[i] = static_cast<uint8_t>(std::floor(aI + ((k & 1u) ? 0.75 : 0.25)));
            mFill[i + 1] = static_cast<uint8_t>(std::floor(aQ + ((k & 1u) ? 0.25 : 0.75)));
        }
    }

    const CNativeRecordLayout& mLayout;
    CNativeRecordFile& mRecords;
    CPrefixFields mFields;
    bool mAlos;
    std::size_t mLineBytes;
    long mShift;      // where a record's byte 0 lands in its line
    bool mOwnLayout;
    std::vector<uint8_t> mFill;
};

/// The lines of ASAR products: the packets read in long contiguous stretches (they lie back to
/// back in the data file, the noise and calibration packets between them read and passed over),
/// their FBAQ blocks decoded on the threads into big-endian floats, a line per packet.
class CPacketLines : public CLineSource {
public:
    CPacketLines(const CNativeArchive& theArchive, CNativeRecordFile& theRecords, int theSamples)
        : mRecords(theRecords), mFields(prefixFields(ENativeFamily::Asar)), mSamplesPos(theArchive.mLayout.mSamplesPos),
          mSamples(static_cast<std::size_t>(theSamples)),
          mLineBytes(static_cast<std::size_t>(CQORV_ASAR_ROW_PREFIX) + 8u * mSamples),
          // One thread writes the chunk before (overlapsWriting), the others decode.
          mThreads(std::clamp(fqorvThreadCount() - 1, 1, 8)), mTables(bigEndianTables(theArchive.mFbaq))
    {
    }

    std::size_t lineBytes() const override { return mLineBytes; }
    /// Larger chunks than a copy's: each chunk's decoding is shared by the threads.
    std::size_t chunkLines() const override { return std::max<std::size_t>(1, CQORV_DECODE_CHUNK_BYTES / mLineBytes); }
    bool overlapsWriting() const override { return true; }

    void assemble(const CPlannedLine* theLines, std::size_t theCount, uint8_t* theOut) override
    {
        readPackets(theLines, theCount);
        // Each line is decoded alone, whatever thread takes it: the product does not depend on
        // the thread count.
        auto aPart = [&](int t) {
            const std::size_t a = theCount * static_cast<std::size_t>(t) / mThreads;
            const std::size_t b = theCount * static_cast<std::size_t>(t + 1) / mThreads;
            for (std::size_t i = a; i < b; ++i) decodeLine(theLines[i], mPacket[i], theOut + i * mLineBytes);
        };
        std::vector<std::thread> aPool;
        const int aThreads = theCount >= 2u * static_cast<std::size_t>(mThreads) ? mThreads : 1;
        for (int t = 1; t < aThreads; ++t) aPool.emplace_back(aPart, t);
        if (aThreads == 1) {
            for (std::size_t i = 0; i < theCount; ++i) decodeLine(theLines[i], mPacket[i], theOut + i * mLineBytes);
        } else {
            aPart(0);
        }
        for (std::thread& x : aPool) x.join();
    }

private:
    /// Packets further apart than this are read apart.
    static constexpr uint64_t CQORV_PACKET_GAP = 1u << 16;
    static constexpr std::size_t CQORV_DECODE_CHUNK_BYTES = 8u << 20;

    /// The tables with their values' bytes in big-endian order, so that decoding writes the
    /// product's byte order straight away.
    static CFbaqTables bigEndianTables(const CFbaqTables& theTables)
    {
        CFbaqTables t = theTables;
        if constexpr (std::endian::native == std::endian::little) {
            for (std::vector<float>* v : {&t.mI, &t.mQ})
                for (float& x : *v) x = std::bit_cast<float>(__builtin_bswap32(std::bit_cast<uint32_t>(x)));
        }
        return t;
    }

    /// Reads the packets of theLines into mBuffer, a read for each stretch of packets that follow
    /// each other in the file; mPacket[i] is where line i's packet begins (none for fill lines).
    void readPackets(const CPlannedLine* theLines, std::size_t theCount)
    {
        mPacket.assign(theCount, std::size_t(-1));
        std::size_t aTotal = 0;
        for (std::size_t i = 0; i < theCount; ++i) {
            const CPlannedLine& l = theLines[i];
            if (l.mSource < 0) continue;
            if (l.mLength < mSamplesPos || fqorvFbaqSamples(l.mLength - mSamplesPos) > mSamples)
                fqorvImportFail(CQORV_ERR_IMPORT_VALUE, "packet of record " + std::to_string(l.mSource) + " (" +
                                                            std::to_string(l.mLength) + " bytes) does not fit its line of " +
                                                            std::to_string(mSamples) + " samples");
            aTotal += l.mLength;
        }
        mBuffer.resize(std::max(mBuffer.size(), aTotal + CQORV_PACKET_GAP));
        std::size_t aAt = 0;
        for (std::size_t a = 0; a < theCount;) {
            if (theLines[a].mSource < 0) {
                ++a;
                continue;
            }
            // A stretch: packets in file order, each close behind the one before.
            const uint64_t aFirst = theLines[a].mOffset;
            uint64_t aEnd = aFirst + theLines[a].mLength;
            std::size_t b = a + 1;
            for (; b < theCount; ++b) {
                const CPlannedLine& l = theLines[b];
                if (l.mSource < 0) continue;
                if (l.mOffset < aEnd || l.mOffset - aEnd > CQORV_PACKET_GAP) break;
                if (aAt + (l.mOffset + l.mLength - aFirst) > mBuffer.size()) break;
                aEnd = l.mOffset + l.mLength;
            }
            if (aAt + (aEnd - aFirst) > mBuffer.size()) mBuffer.resize(aAt + (aEnd - aFirst));
            mRecords.readBytes(aFirst, aEnd - aFirst, mBuffer.data() + aAt);
            for (std::size_t i = a; i < b; ++i)
                if (theLines[i].mSource >= 0) mPacket[i] = aAt + (theLines[i].mOffset - aFirst);
            aAt += aEnd - aFirst;
            a = b;
        }
    }

    void decodeLine(const CPlannedLine& l, std::size_t thePacket, uint8_t* theOut) const
    {
        std::memset(theOut, 0, CQORV_ASAR_ROW_PREFIX);
        std::size_t aDone = 0;
        if (l.mSource >= 0) {
            const uint8_t* aBlocks = mBuffer.data() + thePacket + mSamplesPos;
            fqorvDecodeFbaq4(aBlocks, l.mLength - mSamplesPos, mTables,
                             reinterpret_cast<float*>(theOut + CQORV_ASAR_ROW_PREFIX));
            aDone = fqorvFbaqSamples(l.mLength - mSamplesPos);
        }
        std::memset(theOut + CQORV_ASAR_ROW_PREFIX + 8u * aDone, 0, 8u * (mSamples - aDone));
        putCodes(theOut, mFields, l);
    }

    CNativeRecordFile& mRecords;
    CPrefixFields mFields;
    uint32_t mSamplesPos;
    std::size_t mSamples;
    std::size_t mLineBytes;
    int mThreads;
    CFbaqTables mTables;
    std::vector<uint8_t> mBuffer;
    std::vector<std::size_t> mPacket;
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
    std::unique_ptr<CLineSource> aSource;
    const int aSamples = p.mSamples > 0 ? p.mSamples : a.mLayout.mSamples;
    if (a.mFamily == ENativeFamily::Asar) {
        aSource = std::make_unique<CPacketLines>(a, theRecords, aSamples);
    } else {
        aSource = std::make_unique<CRecordLines>(a, theRecords, aSamples);
    }
    const std::size_t aLineBytes = aSource->lineBytes();
    const std::size_t aChunkLines = aSource->chunkLines();
    std::vector<uint8_t> aOut(aChunkLines * aLineBytes), aWritten;
    CPartFile aPart(theRoot.string() + ".part");
    // A source may assemble a chunk while the one before is written: the write, a copy into the
    // page cache, takes a core of its own. (Declared after aPart: a failure
    // waits for the write under way before the part file goes.)
    std::future<void> aWriting;
    if (aSource->overlapsWriting()) aWritten.resize(aOut.size());
    const std::size_t n = p.mLines.size();
    int aPercent = -1;
    for (std::size_t aFirst = 0; aFirst < n; aFirst += aChunkLines) {
        const std::size_t aCount = std::min(aChunkLines, n - aFirst);
        aSource->assemble(p.mLines.data() + aFirst, aCount, aOut.data());
        if (aSource->overlapsWriting()) {
            if (aWriting.valid()) aWriting.get();
            std::swap(aOut, aWritten);
            aWriting = std::async(std::launch::async, [&aPart, &aWritten, theBytes = aCount * aLineBytes] {
                aPart.write(aWritten.data(), theBytes);
            });
        } else {
            aPart.write(aOut.data(), aCount * aLineBytes);
        }
        const int aNow = static_cast<int>(100 * (aFirst + aCount) / n);
        if (theProgress && aNow != aPercent) theProgress(aNow);
        aPercent = aNow;
    }
    if (aWriting.valid()) aWriting.get();
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
    // The chain takes PRF[0] from PRFExtracted[0] for every sensor but ENVISAT's.
    if (a.mFamily != ENativeFamily::Asar) setVector(h, "ChannelInfo.PRFExtracted", {d.mPrf});
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
    const bool aAsar = a.mFamily == ENativeFamily::Asar;
    h["sar_processing.FirstPixel"].setValue(0);
    h["RasterInfo.NrOfPixelsPerLine"].setValue(d.mSamples);
    h["RasterInfo.NrOfLinesPerImage"].setValue(static_cast<int>(p.mLines.size()));
    // Decoded ASAR samples are floats about 0: the chain measures no I/Q offsets of such lines.
    h["RasterInfo.CellType"].setValue(aAsar ? "FLOAT_COMPLEX" : "UBYTE_COMPLEX");
    if (a.mFamily == ENativeFamily::Ers) h["RasterInfo.DataUnits"].setValue("ERS RAW");
    h["RasterInfo.BytesOrder"].setValue("MSBF");
    h["RasterInfo.HeaderOffset"].setValue(0);
    h["RasterInfo.RowPrefix"].setValue(prefixFields(a.mFamily).mBytes);
    h["RasterInfo.RowSuffix"].setValue(0);
    h["RasterInfo.FooterLen"].setValue(0);
    h["RasterInfo.NullCellValue"].setValue(-9999.0);
    h["RasterInfo.GeocodedImage"].setValue("NotOK");
    std::error_code e;
    const fs::path aSource = fs::absolute(a.mSource, e);
    fqorvSetUserKey(h, "IMPORTED FROM", (e ? a.mSource : aSource).string().c_str());
    fqorvSetUserKey(h, "IMPORT FORMAT", (a.mFormat + (a.mLayoutName.empty() ? "" : ", " + a.mLayoutName)).c_str());
    fqorvSetUserKey(h, "IMPORT RECORDS", (std::to_string(p.mFirstRecord) + " to " + std::to_string(p.mLastRecord)).c_str());
    fqorvSetUserKey(h, "IMPORT ORBIT", d.mOrbitSource.c_str());
    if (a.mFamily != ENativeFamily::Alos) return;
    // The ALOS handling of the chain (the slant range of each line, the transform sizes) rests on
    // the product kind.
    if (!a.mOriginData.empty()) fqorvSetUserKey(h, "ORIGIN DATA", a.mOriginData.c_str());
    // The leader's I/Q bias, for the record: the chain measures the offsets of I and Q from the
    // echoes of every scene, which a stated bias under the chain's own keys would stop.
    if (std::isfinite(a.mIBias) && std::isfinite(a.mQBias))
        fqorvSetUserKey(h, "IMPORT IQ BIAS", fqorvStringFormat("%.4f %.4f", a.mIBias, a.mQBias).c_str());
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
