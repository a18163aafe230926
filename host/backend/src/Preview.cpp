// Preview: the host's preview material (BE::CreatePreview).

#include "BE/Preview.h"

#include "BE/MediaStatus.h"
#include "QRT/Allocated.h"

namespace BE
{
namespace
{

// The material and one of the two kind interfaces (IPreviewRange or
// IPreviewFileSource), which both answer the material itself.
template <class Kind>
class Preview : public QRT::Implements<IPreviewNode, Kind>
{
public:
    Preview(const PreviewSettings& inSettings, VideoSourceRef inSource)
        : mSettings(inSettings)
        , mSource(std::move(inSource))
    {
    }

    const PreviewSettings& GetPreviewSettings() const noexcept override { return mSettings; }
    VideoSourceRef GetVideoSource() const override { return mSource; }
    QRT::InterfaceRef<IPreviewNode> GetPreview() const override
    {
        return QRT::InterfaceRef<IPreviewNode>(
            const_cast<IPreviewNode*>(static_cast<const IPreviewNode*>(this)));
    }

protected:
    ~Preview() = default;

private:
    const PreviewSettings mSettings;
    const VideoSourceRef mSource;
};

} // namespace

PreviewResult CreatePreview(const PreviewSettings& inSettings, PreviewKind inKind)
{
    PreviewResult result;
    if (inSettings.mEnd < inSettings.mStart)
    {
        result.mStatus = {kResult_MediaMalformed,
                          inSettings.mPath + ": the range ends before it starts"};
        return result;
    }
    VideoSourceRef source;
    result.mStatus = OpenVideoSource(inSettings.mPath, source);
    if (!result.mStatus.Succeeded())
        return result;
    if (inKind == PreviewKind::kSequenceRange)
        result.mPreview =
            QRT::Allocated<Preview<IPreviewRange>>::Create<IPreviewNode>(inSettings, source);
    else
        result.mPreview =
            QRT::Allocated<Preview<IPreviewFileSource>>::Create<IPreviewNode>(inSettings, source);
    return result;
}

} // namespace BE
