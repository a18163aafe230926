#pragma once

// Preview material: frames of a part of a sequence rendered ahead of time
// and kept in a file (a Y4M video or a still image), together with the
// stream settings they were rendered at. The cutlist factory turns it into a
// cutlist of one preview node.
//
// Two kinds of host object carry the material; they differ in where its
// frames lie in time:
//   IPreviewRange       a preview of a sequence range: the frames stand in
//                       for the sequence over [start, end); file frame 0
//                       shows at the range's start.
//   IPreviewFileSource  a preview file played as a source of its own: file
//                       frame 0 shows at time zero, and it lasts as long as
//                       the range it was rendered from (end - start).
// Both hand out the material as IPreviewNode, which the renderer's preview
// node answers too (with the material it was built over).
//
// Every object is immutable once made; any thread may call it.

#include "BE/IVideoSource.h"
#include "BE/SequenceTypes.h"
#include "BE/VideoSources.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "mvxmediatypes/Pulldown.h"
#include "mvxmediatypes/TickTime.h"

#include <string>

namespace BE
{

struct PreviewSettings
{
    // The file of rendered frames (.y4m, .png, .jpg, .jpeg).
    std::string mPath;
    // What the frames were rendered at: rate, size, pixel aspect ratio,
    // field type and alpha. The renderer reads the file as these say.
    StreamSettings mStream;
    // The pulldown the file's frames carry, removed when they are read;
    // kPulldownCadence_None when they carry none.
    mvxmediatypes::PulldownCadence mPulldownCadence = mvxmediatypes::kPulldownCadence_None;
    // The rendered part of the sequence, in sequence time.
    mvxmediatypes::TickTime mStart = mvxmediatypes::kTime_Zero;
    mvxmediatypes::TickTime mEnd = mvxmediatypes::kTime_Zero;
    // Legacy flags; either sends the preview down the renderer's older path
    // (the source draws into a frame the renderer makes). The first marks
    // frames written by the older renderer, the second a file written for
    // the older reader.
    bool mLegacyRenderer = false;
    bool mLegacyFile = false;
};

class IPreviewNode : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{0cfe942b-deb9-402e-bbe1-3047222d97ec}");

    virtual const PreviewSettings& GetPreviewSettings() const noexcept = 0;
    // The source of the file's frames, in file time (frame 0 at time zero).
    virtual QRT::InterfaceRef<Deprecated::IVideoSource> GetVideoSource() const = 0;

protected:
    ~IPreviewNode() = default;
};

class IPreviewRange : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{26c283b3-478f-40f8-8526-72d8154b77e9}");

    virtual QRT::InterfaceRef<IPreviewNode> GetPreview() const = 0;

protected:
    ~IPreviewRange() = default;
};

class IPreviewFileSource : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{7f8451ce-d092-458e-b29b-e4e3e88b0916}");

    virtual QRT::InterfaceRef<IPreviewNode> GetPreview() const = 0;

protected:
    ~IPreviewFileSource() = default;
};

enum class PreviewKind
{
    // Answers IPreviewNode and IPreviewRange.
    kSequenceRange,
    // Answers IPreviewNode and IPreviewFileSource.
    kFileSource,
};

struct PreviewResult
{
    // Empty when the material could not be opened.
    QRT::InterfaceRef<IPreviewNode> mPreview;
    // Why not: the file's open status (BE/VideoSources.h), or
    // kResult_MediaMalformed for a range that ends before it starts.
    OpenStatus mStatus;
};

// Opens the file of inSettings now and makes the material of inKind.
PreviewResult CreatePreview(const PreviewSettings& inSettings, PreviewKind inKind);

} // namespace BE
