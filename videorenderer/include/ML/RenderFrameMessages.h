#pragma once

// The three render-frame messages: the station form of the IRenderFrameClient
// calls, posted to a request's station (for the user-interface thread) when
// the request has no live client. Payloads of QRT::MessageImpl; each message
// type's identifier is the hash of its type name. A posted copy holds its own
// reference to the frame.

#include "MF/IVideoFrame.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Message.h"
#include "QRT/Result.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>
#include <string_view>

namespace ML
{

struct RenderFrameCompletionMessageData
{
    static constexpr std::string_view kMessageTypeName = "ML::RenderFrameCompletionMessage";

    std::intptr_t mContext = 0;
    std::uint32_t mRequestID = 0;
    mvxmediatypes::TickTime mTime;
    QRT::InterfaceRef<MF::IVideoFrame> mFrame;
    std::int32_t mRenderMilliseconds = 0;
};

struct RenderFrameCancelledMessageData
{
    static constexpr std::string_view kMessageTypeName = "ML::RenderFrameCancelledMessage";

    std::intptr_t mContext = 0;
    std::uint32_t mRequestID = 0;
    mvxmediatypes::TickTime mTime;
};

struct RenderFrameErrorMessageData
{
    static constexpr std::string_view kMessageTypeName = "ML::RenderFrameErrorMessage";

    std::intptr_t mContext = 0;
    std::uint32_t mRequestID = 0;
    mvxmediatypes::TickTime mTime;
    QRT::Result mStatus = 0;
};

using RenderFrameCompletionMessage = QRT::MessageImpl<RenderFrameCompletionMessageData>;
using RenderFrameCancelledMessage = QRT::MessageImpl<RenderFrameCancelledMessageData>;
using RenderFrameErrorMessage = QRT::MessageImpl<RenderFrameErrorMessageData>;

} // namespace ML
