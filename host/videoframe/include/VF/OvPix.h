#pragma once

// OvPix: the frame handles that plug-ins see. A handle points at a small
// record describing the frame's pixels (bounds, row bytes, pixel address, SDK
// pixel format); behind it the library keeps a reference to the frame, so the
// pixels stay valid until the handle is disposed.
//
// Ownership: NewOvPixFromVideoFrame makes a handle that holds one reference
// to its frame; DisposeOvPixFromVideoFrame releases it and ends the handle.
// Whoever receives a handle (usually a plug-in) disposes it once.
// Threads: every function may be called from any thread. A process-wide
// table from handle to frame, guarded by one lock, is the only state; a frame
// is never released while the lock is held.
// Robustness: the functions look a handle up in the table before touching
// its record, so a disposed, unknown or null handle answers empty, false or
// nothing and is never dereferenced. (A disposed handle's address may be
// reused by a later handle; it then names that handle's frame.)

#include "MF/IVideoFrame.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "VF/SDKPixelFormat.h"

#include <cstddef>
#include <cstdint>

namespace VF
{

// What a plug-in reads through a handle. mPixels is the first byte of the
// top row; rows are mRowBytes apart. mReadOnly is 1 when the frame is shared
// (held by the frame cache for other readers): the pixels must then not be
// written.
struct OvPixRecord
{
    int32_t mLeft = 0;
    int32_t mTop = 0;
    int32_t mRight = 0;
    int32_t mBottom = 0;
    int32_t mRowBytes = 0;
    OvPixelFormat mPixelFormat = kOvPixelFormat_Invalid;
    void* mPixels = nullptr;
    int32_t mReadOnly = 0;
};

using OvPix = OvPixRecord*;

// A new handle holding a reference to inFrame; nullptr for an empty frame or
// a frame whose pixel format has no SDK code.
OvPix NewOvPixFromVideoFrame(const QRT::InterfaceRef<MF::IVideoFrame>& inFrame);

// The frame behind a live handle; empty for a null, unknown or disposed one.
// The handle keeps its own reference.
QRT::InterfaceRef<MF::IVideoFrame> GetVideoFrameFromOvPix(OvPix inHandle);

// The object a live handle maps to, as its root interface (query it for
// MF::IVideoFrame); empty for a null, unknown or disposed handle.
QRT::InterfaceRef<QRT::QRTUnknown> GetOvPixHandFrameMapping(OvPix inHandle);

// Ends a live handle and releases its frame reference. True when the handle
// was live; a null, unknown or already disposed handle answers false and
// changes nothing.
bool DisposeOvPixFromVideoFrame(OvPix inHandle);

// Number of live handles (diagnostics and tests).
size_t GetLiveOvPixCount();

} // namespace VF
