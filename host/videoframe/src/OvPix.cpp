#include "VF/OvPix.h"

#include <memory>
#include <mutex>
#include <unordered_map>

namespace VF
{
namespace
{

struct HandleEntry
{
    std::unique_ptr<OvPixRecord> mRecord;
    QRT::InterfaceRef<MF::IVideoFrame> mFrame;
};

// The table of live handles. sHandleLock guards sHandles.
std::mutex sHandleLock;
std::unordered_map<OvPix, HandleEntry>& Handles()
{
    // Never destroyed: handles may still be disposed while static objects of
    // other libraries are torn down.
    static auto* sHandles = new std::unordered_map<OvPix, HandleEntry>();
    return *sHandles;
}

} // namespace

OvPix NewOvPixFromVideoFrame(const QRT::InterfaceRef<MF::IVideoFrame>& inFrame)
{
    if (!inFrame)
        return nullptr;
    const OvPixelFormat format = BEToSDKPixelFormat(inFrame->GetPixelFormat());
    if (format == kOvPixelFormat_Invalid)
        return nullptr;
    auto record = std::make_unique<OvPixRecord>();
    const QRT::ParamRect bounds = inFrame->GetBounds();
    record->mLeft = bounds.mLeft;
    record->mTop = bounds.mTop;
    record->mRight = bounds.mRight;
    record->mBottom = bounds.mBottom;
    record->mRowBytes = inFrame->GetRowBytes();
    record->mPixelFormat = format;
    const bool shared = inFrame->IsShared();
    record->mReadOnly = shared ? 1 : 0;
    record->mPixels =
        shared ? const_cast<void*>(inFrame->GetBaseAddress()) : inFrame->GetWritableBaseAddress();
    const OvPix handle = record.get();
    std::lock_guard lock(sHandleLock);
    Handles().emplace(handle, HandleEntry{std::move(record), inFrame});
    return handle;
}

QRT::InterfaceRef<MF::IVideoFrame> GetVideoFrameFromOvPix(OvPix inHandle)
{
    std::lock_guard lock(sHandleLock);
    const auto found = Handles().find(inHandle);
    if (found == Handles().end())
        return {};
    return found->second.mFrame;
}

QRT::InterfaceRef<QRT::QRTUnknown> GetOvPixHandFrameMapping(OvPix inHandle)
{
    return QRT::QueryRef<QRT::QRTUnknown>(GetVideoFrameFromOvPix(inHandle));
}

bool DisposeOvPixFromVideoFrame(OvPix inHandle)
{
    HandleEntry entry;
    {
        std::lock_guard lock(sHandleLock);
        const auto found = Handles().find(inHandle);
        if (found == Handles().end())
            return false;
        entry = std::move(found->second);
        Handles().erase(found);
    }
    // The frame reference and the record go here, outside the lock.
    return true;
}

size_t GetLiveOvPixCount()
{
    std::lock_guard lock(sHandleLock);
    return Handles().size();
}

} // namespace VF
