#include "BE/MediaStatus.h"
#include "BE/VideoSources.h"
#include "FileUtilities.h"

namespace BE
{

namespace
{
constexpr std::string_view kPatternPrefix = "pattern:";
} // namespace

OpenStatus OpenVideoSource(const std::string& inSpec, VideoSourceRef& outSource)
{
    outSource.Reset();
    if (std::string_view(inSpec).substr(0, kPatternPrefix.size()) == kPatternPrefix)
    {
        const PatternParseResult parsed = ParsePatternSpec(inSpec);
        if (!parsed.Succeeded())
            return OpenStatus{parsed.mResult, parsed.mMessage};
        outSource = CreatePatternSource(parsed.mSpec);
        return {};
    }
    const std::string extension = detail::GetLowerCaseExtension(inSpec);
    if (extension == "png" || extension == "jpg" || extension == "jpeg")
        return OpenImageFileSource(inSpec, outSource);
    if (extension == "y4m")
        return OpenY4MSource(inSpec, outSource);
    return OpenStatus{kResult_MediaUnsupported,
                      inSpec + ": unknown media (expected .png, .jpg, .jpeg, .y4m or pattern:...)"};
}

} // namespace BE
