#pragma once

// The nodes of a sequence's video segments as the back end describes them
// (the cutlist factory turns them into renderable nodes). A node is a value
// owned by its segment and read by one thread at a time; the media it
// refers to is a shared, counted object.
//
// Kinds: 1 is an imported media node (a piece of media placed on a track);
// the other kinds (clips, effects, transitions, compositors) carry kinds of
// their own and no media.

#include "BE/IMediaInfo.h"
#include "QRT/InterfaceRef.h"

#include <cstdint>

namespace BE
{

inline constexpr std::int32_t kVideoSegmentNodeKind_ImportedMedia = 1;

class VideoSegmentNode
{
public:
    explicit VideoSegmentNode(std::int32_t inKind)
        : mKind(inKind)
    {
    }
    virtual ~VideoSegmentNode() = default;

    std::int32_t GetKind() const noexcept { return mKind; }

private:
    std::int32_t mKind;
};

// A piece of media placed on a track.
class ImportedVideoSegmentNode : public VideoSegmentNode
{
public:
    explicit ImportedVideoSegmentNode(QRT::InterfaceRef<Deprecated::IMedia> inMedia)
        : VideoSegmentNode(kVideoSegmentNodeKind_ImportedMedia)
        , mMedia(std::move(inMedia))
    {
    }

    const QRT::InterfaceRef<Deprecated::IMedia>& GetMedia() const noexcept { return mMedia; }

private:
    QRT::InterfaceRef<Deprecated::IMedia> mMedia;
};

} // namespace BE
