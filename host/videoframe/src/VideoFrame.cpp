#include "VF/VideoFrame.h"

#include "QRT/Allocated.h"
#include "VF/FrameMemoryPool.h"
#include "VF/FrameRect.h"
#include "mvxcore/debug/Contract.h"

#include <atomic>
#include <cstring>
#include <new>

namespace VF
{
namespace
{

using mvxmediatypes::AlphaChannel;
using mvxmediatypes::FieldType;
using mvxmediatypes::PixelAspectRatio;
using mvxmediatypes::PixelFormat;

constexpr size_t RoundUpToRow(size_t inBytes)
{
    return (inBytes + kRowAlignment - 1) / kRowAlignment * kRowAlignment;
}

// Bytes of one sample of a planar format's plane.
uint32_t SampleBytes(const PixelFormat& inFormat)
{
    switch (inFormat.GetSampleKind())
    {
    case mvxmediatypes::kPixelSampleKind_8u:
        return 1;
    case mvxmediatypes::kPixelSampleKind_16u:
    case mvxmediatypes::kPixelSampleKind_16f:
        return 2;
    case mvxmediatypes::kPixelSampleKind_32f:
        return 4;
    default:
        return 0;
    }
}

AlphaChannel DefaultAlphaFor(const PixelFormat& inFormat)
{
    if (!inFormat.HasAlpha())
        return mvxmediatypes::kAlphaChannel_None;
    return inFormat.IsPremultiplied() ? mvxmediatypes::kAlphaChannel_Premultiplied
                                      : mvxmediatypes::kAlphaChannel_Straight;
}

// The attributes a frame carries besides its pixels.
struct FrameAttributes
{
    PixelAspectRatio mRatio = mvxmediatypes::kPixelAspectRatio_Square;
    FieldType mFieldType = mvxmediatypes::kFieldType_Progressive;
    AlphaChannel mAlpha = mvxmediatypes::kAlphaChannel_None;
    uint32_t mOriginX = MF::kNoOriginOffset;
    uint32_t mOriginY = MF::kNoOriginOffset;
    FrameRect mFullFrame{};
    bool mTracksVisible = false;
    FrameRect mVisible{};
};

// A frame and its pooled pixel memory. Owned by its references; the buffer
// goes back to its pool with the last one. Threads: see MF/IVideoFrame.h.
class VideoFrameImpl
    : public QRT::Implements<MF::IVideoFrame, MF::IVideoFrameRowBytes, MF::IVideoFrameBaseAddress>
{
public:
    VideoFrameImpl(PixelFormat inFormat, uint32_t inWidth, uint32_t inHeight,
                   const FrameLayout& inLayout, PoolBuffer inBuffer, FrameMemoryPool& inPool,
                   const FrameAttributes& inAttributes)
        : mFormat(inFormat)
        , mWidth(inWidth)
        , mHeight(inHeight)
        , mLayout(inLayout)
        , mBuffer(inBuffer)
        , mPool(inPool)
        , mAttributes(inAttributes)
    {
    }

    ~VideoFrameImpl() { mPool.Return(mBuffer); }

    PixelFormat GetPixelFormat() const noexcept override { return mFormat; }
    FrameRect GetBounds() const noexcept override
    {
        return FrameRect{0, 0, static_cast<int32_t>(mWidth), static_cast<int32_t>(mHeight)};
    }
    int32_t GetRowBytes() const noexcept override { return mLayout.mPlanes[0].mRowBytes; }
    uint32_t GetPlaneCount() const noexcept override { return mLayout.mPlaneCount; }
    int32_t GetPlaneRowBytes(uint32_t inPlane) const override
    {
        MVX_INPUT_CONTRACT(inPlane < mLayout.mPlaneCount);
        return mLayout.mPlanes[inPlane].mRowBytes;
    }
    const void* GetPlaneBaseAddress(uint32_t inPlane) const override
    {
        MVX_INPUT_CONTRACT(inPlane < mLayout.mPlaneCount);
        return static_cast<const std::byte*>(mBuffer.mData) + mLayout.mPlanes[inPlane].mOffset;
    }
    void* GetWritablePlaneBaseAddress(uint32_t inPlane) override
    {
        MVX_INPUT_CONTRACT(inPlane < mLayout.mPlaneCount);
        MVX_INPUT_CONTRACT(!IsShared());
        return static_cast<std::byte*>(mBuffer.mData) + mLayout.mPlanes[inPlane].mOffset;
    }
    const void* GetBaseAddress() const noexcept override { return mBuffer.mData; }
    void* GetWritableBaseAddress() override
    {
        MVX_INPUT_CONTRACT(!IsShared());
        return mBuffer.mData;
    }
    size_t GetDataSize() const noexcept override { return mLayout.mTotalBytes; }

    PixelAspectRatio GetPixelAspectRatio() const noexcept override { return mAttributes.mRatio; }
    void SetPixelAspectRatio(PixelAspectRatio inRatio) override
    {
        MVX_INPUT_CONTRACT(!IsShared());
        mAttributes.mRatio = inRatio;
    }
    FieldType GetFieldType() const noexcept override { return mAttributes.mFieldType; }
    void SetFieldType(FieldType inFieldType) override
    {
        MVX_INPUT_CONTRACT(!IsShared());
        mAttributes.mFieldType = inFieldType;
    }
    AlphaChannel GetAlphaChannel() const noexcept override { return mAttributes.mAlpha; }
    void SetAlphaChannel(AlphaChannel inAlpha) override
    {
        MVX_INPUT_CONTRACT(!IsShared());
        mAttributes.mAlpha = inAlpha;
    }
    bool HasAlpha() const noexcept override
    {
        return mFormat.HasAlpha() && mAttributes.mAlpha != mvxmediatypes::kAlphaChannel_None &&
               mAttributes.mAlpha != mvxmediatypes::kAlphaChannel_Ignore;
    }
    bool IsAlphaOpaque() const override
    {
        int8_t known = mAlphaOpaque.load(std::memory_order_acquire);
        if (known < 0)
        {
            known = ScanAlphaOpaque() ? 1 : 0;
            mAlphaOpaque.store(known, std::memory_order_release);
        }
        return known == 1;
    }
    void AlphaChanged() noexcept override { mAlphaOpaque.store(-1, std::memory_order_release); }

    uint32_t GetRenderTime() const noexcept override
    {
        return mRenderTime.load(std::memory_order_relaxed);
    }
    void SetRenderTime(uint32_t inMilliseconds) noexcept override
    {
        mRenderTime.store(inMilliseconds, std::memory_order_relaxed);
    }

    void GetOriginOffset(uint32_t& outX, uint32_t& outY) const noexcept override
    {
        outX = mAttributes.mOriginX;
        outY = mAttributes.mOriginY;
    }
    void SetOriginOffset(uint32_t inX, uint32_t inY) override
    {
        MVX_INPUT_CONTRACT(!IsShared());
        mAttributes.mOriginX = inX;
        mAttributes.mOriginY = inY;
    }

    bool HasFullFrame(int32_t inWhole) const override
    {
        MVX_INPUT_CONTRACT(inWhole == 0 || inWhole == 1);
        if (IsAllZero(mAttributes.mFullFrame))
            return false;
        return inWhole == 0 || mAttributes.mFullFrame == GetBounds();
    }
    FrameRect GetFullFrameRect() const noexcept override { return mAttributes.mFullFrame; }
    void SetFullFrameRect(const FrameRect& inRect) override
    {
        MVX_INPUT_CONTRACT(!IsShared());
        MVX_INPUT_CONTRACT(IsAllZero(inRect) || !inRect.IsEmpty());
        mAttributes.mFullFrame = inRect;
    }
    bool CanProvideRect(const FrameRect& inRect) const noexcept override
    {
        return Contains(GetBounds(), inRect);
    }

    bool TracksVisibleContent() const noexcept override { return mAttributes.mTracksVisible; }
    FrameRect GetVisibleContentRect() const noexcept override
    {
        return mAttributes.mTracksVisible ? mAttributes.mVisible : GetBounds();
    }
    void SetVisibleContentRect(const FrameRect& inRect) override
    {
        MVX_INPUT_CONTRACT(!IsShared());
        mAttributes.mTracksVisible = true;
        mAttributes.mVisible = Intersect(inRect, GetBounds());
    }
    void GrowVisibleContentRect(const FrameRect& inRect) override
    {
        MVX_INPUT_CONTRACT(!IsShared());
        if (mAttributes.mTracksVisible)
            mAttributes.mVisible = Union(mAttributes.mVisible, Intersect(inRect, GetBounds()));
    }

    void MarkShared(int32_t inShared) override
    {
        MVX_INPUT_CONTRACT(inShared != 0 || !IsShared());
        if (inShared != 0)
            mShared.store(true, std::memory_order_release);
    }
    bool IsShared() const noexcept override { return mShared.load(std::memory_order_acquire); }

    QRT::InterfaceRef<MF::IVideoFrame> CreateEmptyFrame(bool inClear) const override;

    // The attributes, for copies.
    const FrameAttributes& GetAttributes() const noexcept { return mAttributes; }

private:
    bool ScanAlphaOpaque() const;

    const PixelFormat mFormat;
    const uint32_t mWidth;
    const uint32_t mHeight;
    const FrameLayout mLayout;
    const PoolBuffer mBuffer;
    FrameMemoryPool& mPool;
    // Written only while the frame is not shared (one owner thread).
    FrameAttributes mAttributes;
    std::atomic<bool> mShared{false};
    std::atomic<uint32_t> mRenderTime{0};
    // Remembered alpha analysis: -1 unknown, 0 not opaque, 1 opaque.
    mutable std::atomic<int8_t> mAlphaOpaque{-1};
};

bool VideoFrameImpl::ScanAlphaOpaque() const
{
    if (!mFormat.HasAlpha() || mFormat.GetChroma() != mvxmediatypes::kPixelChroma_444 ||
        mFormat.GetChannelCount() != 4)
        return true;
    // Alpha is the last of the four channels in every packed alpha format.
    const auto* row = static_cast<const std::byte*>(mBuffer.mData);
    const size_t rowBytes = static_cast<size_t>(GetRowBytes());
    for (uint32_t y = 0; y < mHeight; ++y, row += rowBytes)
    {
        switch (mFormat.GetSampleKind())
        {
        case mvxmediatypes::kPixelSampleKind_8u:
            for (uint32_t x = 0; x < mWidth; ++x)
                if (std::to_integer<uint8_t>(row[x * 4 + 3]) != 0xFF)
                    return false;
            break;
        case mvxmediatypes::kPixelSampleKind_16u:
        case mvxmediatypes::kPixelSampleKind_16f:
        {
            // Opaque is 0xFFFF for 16-bit unsigned and 0x3C00 (1.0) for half float.
            const uint16_t opaque =
                mFormat.GetSampleKind() == mvxmediatypes::kPixelSampleKind_16f ? 0x3C00 : 0xFFFF;
            for (uint32_t x = 0; x < mWidth; ++x)
            {
                uint16_t alpha;
                std::memcpy(&alpha, row + x * 8 + 6, sizeof alpha);
                if (alpha != opaque)
                    return false;
            }
            break;
        }
        case mvxmediatypes::kPixelSampleKind_32f:
            for (uint32_t x = 0; x < mWidth; ++x)
            {
                float alpha;
                std::memcpy(&alpha, row + x * 16 + 12, sizeof alpha);
                if (alpha < 1.0f)
                    return false;
            }
            break;
        default:
            return true;
        }
    }
    return true;
}

QRT::Result MakeFrame(PixelFormat inFormat, uint32_t inWidth, uint32_t inHeight,
                      const FrameAttributes& inAttributes, bool inClear,
                      QRT::InterfaceRef<MF::IVideoFrame>& outFrame)
{
    outFrame.Reset();
    FrameLayout layout;
    const QRT::Result status = ComputeFrameLayout(inFormat, inWidth, inHeight, layout);
    if (status != QRT::kResult_Success)
        return status;
    FrameMemoryPool& pool = FrameMemoryPool::GetShared();
    const PoolBuffer buffer = pool.Acquire(layout.mTotalBytes);
    if (buffer.mData == nullptr)
        return kResult_OutOfFrameMemory;
    if (inClear)
        std::memset(buffer.mData, 0, layout.mTotalBytes);
    try
    {
        outFrame = QRT::Allocated<VideoFrameImpl>::Create<MF::IVideoFrame>(
            inFormat, inWidth, inHeight, layout, buffer, pool, inAttributes);
    }
    catch (const std::bad_alloc&)
    {
        pool.Return(buffer);
        return kResult_OutOfFrameMemory;
    }
    MVX_OUTPUT_CONTRACT(outFrame);
    return QRT::kResult_Success;
}

QRT::InterfaceRef<MF::IVideoFrame> VideoFrameImpl::CreateEmptyFrame(bool inClear) const
{
    FrameAttributes attributes = mAttributes;
    attributes.mVisible = FrameRect{};
    QRT::InterfaceRef<MF::IVideoFrame> frame;
    const QRT::Result status = MakeFrame(mFormat, mWidth, mHeight, attributes,
                                         inClear || attributes.mTracksVisible, frame);
    if (status == kResult_OutOfFrameMemory)
        throw std::bad_alloc();
    return frame;
}

} // namespace

QRT::Result ComputeFrameLayout(PixelFormat inFormat, uint32_t inWidth, uint32_t inHeight,
                               FrameLayout& outLayout)
{
    outLayout = FrameLayout{};
    if (!inFormat.IsValid() || !inFormat.IsRaster())
        return kResult_InvalidPixelFormat;
    if (inWidth == 0 || inHeight == 0 || inWidth > kMaxFrameDimension ||
        inHeight > kMaxFrameDimension)
        return kResult_InvalidFrameSize;
    const uint32_t chroma = inFormat.GetChroma();
    if (chroma == mvxmediatypes::kPixelChroma_420)
    {
        const uint32_t sample = SampleBytes(inFormat);
        if (sample == 0)
            return kResult_InvalidPixelFormat;
        const uint32_t chromaWidth = (inWidth + 1) / 2;
        const uint32_t chromaHeight = (inHeight + 1) / 2;
        const uint32_t widths[3] = {inWidth, chromaWidth, chromaWidth};
        const uint32_t heights[3] = {inHeight, chromaHeight, chromaHeight};
        size_t offset = 0;
        for (uint32_t plane = 0; plane < 3; ++plane)
        {
            const size_t rowBytes = RoundUpToRow(size_t{widths[plane]} * sample);
            outLayout.mPlanes[plane] = {offset, static_cast<int32_t>(rowBytes), heights[plane]};
            offset += rowBytes * heights[plane];
        }
        outLayout.mPlaneCount = 3;
        outLayout.mTotalBytes = offset;
        return QRT::kResult_Success;
    }
    size_t rowBytes = 0;
    if (chroma == mvxmediatypes::kPixelChroma_444)
    {
        rowBytes = size_t{inWidth} * inFormat.GetBytesPerPixel();
    }
    else if (chroma == mvxmediatypes::kPixelChroma_422Pairs)
    {
        // The width counts stored pixel pairs, each two samples of luma and
        // one pair of chroma.
        rowBytes = size_t{inWidth} * 2 * inFormat.GetBytesPerPixel();
    }
    else
    {
        // 4:2:2 packed: pixel pairs share chroma, so an odd width needs one
        // more pixel's room.
        rowBytes = size_t{inWidth + (inWidth & 1)} * inFormat.GetBytesPerPixel();
    }
    if (rowBytes == 0)
        return kResult_InvalidPixelFormat;
    rowBytes = RoundUpToRow(rowBytes);
    outLayout.mPlaneCount = 1;
    outLayout.mPlanes[0] = {0, static_cast<int32_t>(rowBytes), inHeight};
    outLayout.mTotalBytes = rowBytes * inHeight;
    return QRT::kResult_Success;
}

QRT::Result CreateVideoFrame(PixelFormat inFormat, uint32_t inWidth, uint32_t inHeight,
                             PixelAspectRatio inRatio, bool inClear, bool inTrackVisibleContent,
                             QRT::InterfaceRef<MF::IVideoFrame>& outFrame)
{
    FrameAttributes attributes;
    attributes.mRatio = inRatio;
    attributes.mAlpha = DefaultAlphaFor(inFormat);
    attributes.mTracksVisible = inTrackVisibleContent;
    return MakeFrame(inFormat, inWidth, inHeight, attributes, inClear || inTrackVisibleContent,
                     outFrame);
}

QRT::InterfaceRef<MF::IVideoFrame> CreateVideoFrame(PixelFormat inFormat, uint32_t inWidth,
                                                    uint32_t inHeight, PixelAspectRatio inRatio,
                                                    bool inClear, bool inTrackVisibleContent)
{
    QRT::InterfaceRef<MF::IVideoFrame> frame;
    CreateVideoFrame(inFormat, inWidth, inHeight, inRatio, inClear, inTrackVisibleContent, frame);
    return frame;
}

void CopyFramePixels(const MF::IVideoFrame& inSource, MF::IVideoFrame& inDestination)
{
    MVX_INPUT_CONTRACT(!inDestination.IsShared());
    MVX_INPUT_CONTRACT(inSource.GetPixelFormat() == inDestination.GetPixelFormat());
    MVX_INPUT_CONTRACT(inSource.GetBounds() == inDestination.GetBounds());
    FrameLayout layout;
    const FrameRect bounds = inSource.GetBounds();
    ComputeFrameLayout(inSource.GetPixelFormat(), static_cast<uint32_t>(bounds.Width()),
                       static_cast<uint32_t>(bounds.Height()), layout);
    for (uint32_t plane = 0; plane < layout.mPlaneCount; ++plane)
    {
        // Equal format and size give equal layouts, so each plane is one run.
        const size_t bytes = size_t(layout.mPlanes[plane].mRowBytes) * layout.mPlanes[plane].mRows;
        std::memcpy(inDestination.GetWritablePlaneBaseAddress(plane),
                    inSource.GetPlaneBaseAddress(plane), bytes);
    }
}

QRT::InterfaceRef<MF::IVideoFrame>
MakeWriteableVideoFrame(const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
                        mvxmediatypes::RenderQuality /*inQuality*/)
{
    MVX_INPUT_CONTRACT(inFrame != nullptr);
    if (!inFrame->IsShared())
    {
        // The count after our own reference is added: 2 means the caller's is
        // the only other one. Nobody can add a reference meanwhile without
        // holding one already.
        const uint32_t count = inFrame->AddRef();
        inFrame->Release();
        if (count == 2)
            return inFrame;
    }
    QRT::InterfaceRef<MF::IVideoFrame> copy = inFrame->CreateEmptyFrame(false);
    MVX_OUTPUT_CONTRACT(copy != nullptr);
    CopyFramePixels(*inFrame, *copy);
    if (inFrame->TracksVisibleContent())
        copy->SetVisibleContentRect(inFrame->GetVisibleContentRect());
    copy->SetRenderTime(inFrame->GetRenderTime());
    return copy;
}

} // namespace VF
