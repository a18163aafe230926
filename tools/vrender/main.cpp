// vrender: the command-line renderer. Parses the command line, brings the
// renderer up, runs the command and takes the renderer down again.
//
// Exit codes: 0 success, 1 a failure while rendering (unreadable media, a
// frame that failed, an output that cannot be written), 2 bad arguments,
// 130 cancelled with Ctrl-C.

#include "CutlistInfo.h"
#include "ML/RenderExecutors.h"
#include "ML/VideoRenderer.h"
#include "Options.h"
#include "Progress.h"
#include "RenderJob.h"

#include <atomic>
#include <csignal>
#include <cstdio>
#include <exception>
#include <string>
#include <string_view>
#include <unistd.h>
#include <vector>

namespace
{

// Set by the signal handler, read by the render loop.
std::atomic<bool> sCancelRequested{false};

extern "C" void OnInterrupt(int inSignal)
{
    sCancelRequested.store(true);
    // A second Ctrl-C ends the program at once.
    std::signal(inSignal, SIG_DFL);
}

void InstallSignalHandlers()
{
    std::signal(SIGINT, OnInterrupt);
    std::signal(SIGTERM, OnInterrupt);
    // A reader that goes away makes writes fail with EPIPE, which is reported,
    // instead of killing the process.
    std::signal(SIGPIPE, SIG_IGN);
}

// Brings the renderer up for the lifetime of one command.
class RendererSession
{
public:
    RendererSession()
    {
        ML::Foundation::StartUp();
        ML::VideoRenderer::Initialize();
    }
    ~RendererSession()
    {
        ML::VideoRenderer::Shutdown();
        ML::Foundation::ShutDown();
    }
    RendererSession(const RendererSession&) = delete;
    RendererSession& operator=(const RendererSession&) = delete;
};

int RunInfo()
{
    RendererSession session;
    const auto cutlist = vrender::CreateExampleCutlist();
    const std::string text = vrender::DescribeCutlist(*cutlist);
    std::fwrite(text.data(), 1, text.size(), stdout);
    return 0;
}

int RunRender(const vrender::RenderOptions& inOptions, bool inDemo)
{
    if (inOptions.mOutputKind == vrender::OutputKind::kY4MStream && isatty(STDOUT_FILENO))
    {
        std::fprintf(stderr, "vrender: standard output is a terminal; redirect the Y4M stream "
                             "(> out.y4m) or pipe it (| ffplay -)\n");
        return 2;
    }
    vrender::RenderEnvironment environment;
    environment.mShowProgress = !inOptions.mQuiet && isatty(STDERR_FILENO);
    environment.mCancel = &sCancelRequested;
    if (inDemo)
        std::fprintf(stderr, "vrender: rendering the demo (%s, %lld frames)\n",
                     inOptions.mMedia.c_str(),
                     static_cast<long long>(inOptions.mCount.value_or(0)));

    vrender::RenderOutcome outcome;
    {
        RendererSession session;
        outcome = vrender::RunRender(inOptions, environment);
    }
    if (outcome.mExitCode == 130)
    {
        std::fprintf(stderr, "vrender: %s\n",
                     vrender::FormatCancelled(outcome.mFramesWritten).c_str());
        return 130;
    }
    if (outcome.mExitCode != 0)
    {
        std::fprintf(stderr, "vrender: %s\n", outcome.mError.c_str());
        return outcome.mExitCode;
    }
    const std::string summary =
        vrender::FormatSummary(outcome.mFramesWritten, outcome.mSeconds, outcome.mWhere);
    std::fprintf(stderr, "%s\n", summary.c_str());
    if (inDemo && outcome.mFramesWritten > 0 &&
        inOptions.mOutputKind == vrender::OutputKind::kPngSequence)
    {
        const std::int64_t first = inOptions.mStart.value_or(0);
        std::fprintf(
            stderr, "vrender: the demo frames are %s to %s\n",
            vrender::FormatFramePath(inOptions.mOutputPath, first).c_str(),
            vrender::FormatFramePath(inOptions.mOutputPath, first + outcome.mFramesWritten - 1)
                .c_str());
    }
    return 0;
}

} // namespace

int main(int inArgc, char** inArgv)
{
    InstallSignalHandlers();
    const std::vector<std::string_view> arguments(inArgv + 1, inArgv + inArgc);
    const vrender::ParsedCommandLine parsed = vrender::ParseCommandLine(arguments);
    if (!parsed.Succeeded())
    {
        std::fprintf(stderr, "vrender: %s\nRun 'vrender --help' for the commands and options.\n",
                     parsed.mError.c_str());
        return 2;
    }
    try
    {
        switch (parsed.mCommand)
        {
        case vrender::Command::kHelp:
        {
            const std::string usage = vrender::GetUsageText();
            std::fwrite(usage.data(), 1, usage.size(), stdout);
            return 0;
        }
        case vrender::Command::kInfo:
            return RunInfo();
        case vrender::Command::kDemo:
            return RunRender(parsed.mOptions, true);
        case vrender::Command::kSource:
            return RunRender(parsed.mOptions, false);
        }
    }
    catch (const std::exception& inException)
    {
        std::fprintf(stderr, "vrender: internal error: %s\n", inException.what());
        return 1;
    }
    return 1;
}
