// Multicam media (BE::CreateMulticamMedia): camera angles, each a media of
// its own, of which the settings pick the one shown.

#include "BE/Sequence.h"
#include "QRT/Allocated.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>

namespace BE
{
namespace
{

namespace mt = mvxmediatypes;

// The multicam media's own stream: it has no source of its own, its
// frames are made from its angles'.
class MulticamStream : public QRT::Implements<IMediaStream>
{
public:
    explicit MulticamStream(const StreamSettings& inSettings)
        : mSettings(inSettings)
    {
    }

    const StreamSettings& GetStreamSettings() const noexcept override { return mSettings; }
    VideoSourceRef GetVideoSource() const override { return {}; }

private:
    const StreamSettings mSettings;
};

class MulticamMedia : public QRT::Implements<ISequenceMedia, IMediaDuration, IMulticamMedia>
{
public:
    MulticamMedia(const MediaSettings& inSettings, std::vector<MediaRef> inAngles,
                  const StreamSettings& inStream, bool inStill, mt::TickTime inDuration)
        : mSettings(inSettings)
        , mAngles(std::move(inAngles))
        , mStream(QRT::Allocated<MulticamStream>::Create<IMediaStream>(inStream))
        , mStill(inStill)
        , mDuration(inDuration)
    {
    }

    const MediaSettings& GetMediaSettings() const noexcept override { return mSettings; }
    std::size_t GetVideoStreamCount() const noexcept override { return 1; }
    QRT::InterfaceRef<IMediaStream> GetVideoStream(std::size_t inIndex) const override
    {
        MVX_INPUT_CONTRACT(inIndex == 0);
        return mStream;
    }
    bool IsOffline() const noexcept override { return mSettings.mOffline; }
    bool IsPending() const noexcept override { return mSettings.mPending; }
    bool IsDraft() const noexcept override { return mSettings.mDraft; }
    bool IsStill() const noexcept override { return mStill; }
    const MF::BinaryData& GetOpaqueData() const noexcept override { return mSettings.mOpaqueData; }
    const ColorProfile& GetColorProfile() const noexcept override
    {
        return mSettings.mColorProfile;
    }
    SequenceRef GetNestedSequence() const override { return {}; }

    mt::TickTime GetDuration() const noexcept override { return mDuration; }

    std::size_t GetAngleCount() const noexcept override { return mAngles.size(); }
    MediaRef GetAngle(std::size_t inIndex) const override
    {
        MVX_INPUT_CONTRACT(inIndex < mAngles.size());
        return mAngles[inIndex];
    }

private:
    const MediaSettings mSettings;
    const std::vector<MediaRef> mAngles;
    const QRT::InterfaceRef<IMediaStream> mStream;
    const bool mStill;
    const mt::TickTime mDuration;
};

} // namespace

MediaRef CreateMulticamMedia(const MediaSettings& inSettings, std::vector<MediaRef> inAngles)
{
    MVX_INPUT_CONTRACT(inSettings.mKind == MediaKind::kMulticam);
    MVX_INPUT_CONTRACT(!inAngles.empty());
    MVX_INPUT_CONTRACT(inSettings.mMulticam.mSelected < inAngles.size());
    bool still = true;
    mt::TickTime duration = mt::kTime_Zero;
    for (const MediaRef& angle : inAngles)
    {
        MVX_INPUT_CONTRACT(angle != nullptr);
        still = still && angle->IsStill();
        duration = std::max(duration, QRT::InterfaceRef<IMediaDuration>(angle)->GetDuration());
    }
    const StreamSettings stream =
        inSettings.mStream.value_or(inAngles.front()->GetVideoStream(0)->GetStreamSettings());
    return QRT::Allocated<MulticamMedia>::Create<ISequenceMedia>(
        inSettings, std::move(inAngles), stream, still, inSettings.mDuration.value_or(duration));
}

} // namespace BE
