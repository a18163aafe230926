#include "BE/MediaStatus.h"
#include "BE/VideoSources.h"
#include "FileUtilities.h"

namespace BE
{

namespace
{
constexpr std::string_view kPatternPrefix = "pattern:";
} // namespace

OpenStatus OpenVideoSource(const std::string& inMedia, VideoSourceRef& outSource)
{
    outSource.Reset();
    if (std::string_view(inMedia).substr(0, kPatternPrefix.size()) == kPatternPrefix)
    {
        const PatternParseResult parsed = ParsePatternSettings(inMedia);
        if (!parsed.Succeeded())
            return OpenStatus{parsed.mResult, parsed.mMessage};
        outSource = CreatePatternSource(parsed.mSettings);
        return {};
    }
    const std::string extension = detail::GetLowerCaseExtension(inMedia);
    if (extension == "png" || extension == "jpg" || extension == "jpeg")
        return OpenImageFileSource(inMedia, outSource);
    if (extension == "y4m")
        return OpenY4MSource(inMedia, outSource);
    return OpenStatus{kResult_MediaUnsupported,
                      inMedia +
                          ": unknown media (expected .png, .jpg, .jpeg, .y4m or pattern:...)"};
}

} // namespace BE
