#include "BE/MediaStatus.h"
#include "BE/VideoSources.h"
#include "FileUtilities.h"

#include <sys/stat.h>

namespace BE
{

namespace
{
constexpr std::string_view kPatternPrefix = "pattern:";

// What a path that exists names, when it is not a regular file; empty
// otherwise (a missing file is left to the opener, which names the error).
// Reading a FIFO or a device would wait for a writer or read without end.
std::string DescribeIrregularFile(const std::string& inPath)
{
    struct stat info = {};
    if (stat(inPath.c_str(), &info) != 0 || S_ISREG(info.st_mode))
        return {};
    const char* kind = S_ISDIR(info.st_mode)    ? "a directory"
                       : S_ISFIFO(info.st_mode) ? "a FIFO"
                       : S_ISSOCK(info.st_mode) ? "a socket"
                                                : "a device";
    return inPath + ": not a regular file (" + kind + ")";
}
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
    const std::string irregular = DescribeIrregularFile(inMedia);
    if (!irregular.empty())
        return OpenStatus{kResult_MediaCannotOpen, irregular};
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
