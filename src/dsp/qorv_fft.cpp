#include "qorv_fft.h"

#include <fftw3.h>

#include <cstdint>
#include <cstring>
#include <string>
#include <utility>

#include "qorv_enviroment.h"
#include "qorv_errors.h"

namespace {

int gFftThreads = 1;
bool gFftThreadsReady = false;

int sign(FftDirection d) { return d == FftDirection::Forward ? FFTW_FORWARD : FFTW_BACKWARD; }

void planFailure(const char* theWhat, int a, int b)
{
    const std::string aText = std::string(theWhat) + " " + std::to_string(a) + " x " + std::to_string(b);
    fdfTrace("\nFFT plan failed: %s\n", aText.c_str());
    QORV_FATAL(CQORV_ERR_MEMORY, aText.c_str());
}

void useThreads(bool theThreaded)
{
    if (!gFftThreadsReady) {
        fftwf_init_threads();
        gFftThreadsReady = true;
    }
    fftwf_plan_with_nthreads(theThreaded ? gFftThreads : 1);
}

/// Scratch of a plan: FFTW_ESTIMATE never reads or writes the arrays it plans on, so the scratch is
/// allocated and left untouched; its pages are never faulted in (a block plan's would be hundreds
/// of megabytes).
struct CPlanScratch {
    explicit CPlanScratch(std::size_t n) : mData(fftwf_alloc_complex(n))
    {
        if (!mData) QORV_FATAL(CQORV_ERR_MEMORY, "FFT plan scratch");
    }
    ~CPlanScratch() { fftwf_free(mData); }
    CPlanScratch(const CPlanScratch&) = delete;
    CPlanScratch& operator=(const CPlanScratch&) = delete;
    fftwf_complex* mData;
};

}  // namespace

void fqorvFftSetThreads(int theThreads) { gFftThreads = theThreads < 1 ? 1 : theThreads; }

FftPlan1D::FftPlan1D(int theSize, FftDirection theDirection) : mSize(theSize), mDirection(theDirection)
{
    if (theSize < 1) planFailure("1-D plan of size", theSize, 1);
    useThreads(false);
    // Plans are made on scratch buffers with FFTW_ESTIMATE so that making one never touches the
    // caller's data; one plan serves aligned data, the other any alignment.
    CPlanScratch aScratch(static_cast<std::size_t>(theSize));
    fftwf_complex* aData = aScratch.mData;
    mPlanAligned = fftwf_plan_dft_1d(theSize, aData, aData, sign(theDirection), FFTW_ESTIMATE);
    mPlanUnaligned = fftwf_plan_dft_1d(theSize, aData, aData, sign(theDirection), FFTW_ESTIMATE | FFTW_UNALIGNED);
    if (!mPlanAligned || !mPlanUnaligned) planFailure("1-D plan of size", theSize, 1);
}

FftPlan1D::FftPlan1D(FftPlan1D&& o) noexcept
    : mSize(o.mSize), mDirection(o.mDirection), mPlanAligned(std::exchange(o.mPlanAligned, nullptr)),
      mPlanUnaligned(std::exchange(o.mPlanUnaligned, nullptr))
{
}

FftPlan1D::~FftPlan1D()
{
    if (mPlanAligned) fftwf_destroy_plan(static_cast<fftwf_plan>(mPlanAligned));
    if (mPlanUnaligned) fftwf_destroy_plan(static_cast<fftwf_plan>(mPlanUnaligned));
}

void FftPlan1D::execute(fcomplex* theData) const
{
    auto* aData = reinterpret_cast<fftwf_complex*>(theData);
    const bool aAligned = (reinterpret_cast<std::uintptr_t>(theData) % 16) == 0;
    fftwf_execute_dft(static_cast<fftwf_plan>(aAligned ? mPlanAligned : mPlanUnaligned), aData, aData);
}

FftPlan2D::FftPlan2D(int theRows, int theCols, FftDirection theDirection, bool theThreaded)
    : mRows(theRows), mCols(theCols), mDirection(theDirection)
{
    if (theRows < 1 || theCols < 1) planFailure("2-D plan of size", theRows, theCols);
    useThreads(theThreaded);
    CPlanScratch aScratch(static_cast<std::size_t>(theRows) * theCols);
    fftwf_complex* aData = aScratch.mData;
    mPlan = fftwf_plan_dft_2d(theRows, theCols, aData, aData, sign(theDirection), FFTW_ESTIMATE | FFTW_UNALIGNED);
    useThreads(false);
    if (!mPlan) planFailure("2-D plan of size", theRows, theCols);
}

FftPlan2D::~FftPlan2D()
{
    if (mPlan) fftwf_destroy_plan(static_cast<fftwf_plan>(mPlan));
}

void FftPlan2D::execute(fcomplex* theData) const
{
    auto* aData = reinterpret_cast<fftwf_complex*>(theData);
    fftwf_execute_dft(static_cast<fftwf_plan>(mPlan), aData, aData);
}

FftPlanColumns::FftPlanColumns(int theRows, int theCols, FftDirection theDirection, bool theThreaded)
    : mRows(theRows), mCols(theCols), mDirection(theDirection)
{
    if (theRows < 1 || theCols < 1) planFailure("column plan of size", theRows, theCols);
    useThreads(theThreaded);
    CPlanScratch aScratch(static_cast<std::size_t>(theRows) * theCols);
    fftwf_complex* aData = aScratch.mData;
    int aN[1] = {theRows};
    // Column c starts at element c; consecutive points of a column are one row apart.
    mPlan = fftwf_plan_many_dft(1, aN, theCols, aData, nullptr, theCols, 1, aData, nullptr, theCols, 1,
                                sign(theDirection), FFTW_ESTIMATE | FFTW_UNALIGNED);
    useThreads(false);
    if (!mPlan) planFailure("column plan of size", theRows, theCols);
}

FftPlanColumns::~FftPlanColumns()
{
    if (mPlan) fftwf_destroy_plan(static_cast<fftwf_plan>(mPlan));
}

void FftPlanColumns::execute(fcomplex* theData) const
{
    auto* aData = reinterpret_cast<fftwf_complex*>(theData);
    fftwf_execute_dft(static_cast<fftwf_plan>(mPlan), aData, aData);
}

FftBuffer::FftBuffer(std::size_t theSize) : mSize(theSize)
{
    if (theSize == 0) return;
    mData = reinterpret_cast<fcomplex*>(fftwf_alloc_complex(theSize));
    if (!mData) QORV_FATAL(CQORV_ERR_MEMORY, "FFT buffer");
    clear();
}

FftBuffer::~FftBuffer()
{
    if (mData) fftwf_free(mData);
}

FftBuffer::FftBuffer(FftBuffer&& o) noexcept
    : mData(std::exchange(o.mData, nullptr)), mSize(std::exchange(o.mSize, 0))
{
}

FftBuffer& FftBuffer::operator=(FftBuffer&& o) noexcept
{
    if (this != &o) {
        if (mData) fftwf_free(mData);
        mData = std::exchange(o.mData, nullptr);
        mSize = std::exchange(o.mSize, 0);
    }
    return *this;
}

void FftBuffer::clear()
{
    if (mData) std::memset(static_cast<void*>(mData), 0, mSize * sizeof(fcomplex));
}
