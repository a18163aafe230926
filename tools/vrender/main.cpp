// vrender: the command-line renderer. Parses the command line, brings the
// renderer up, runs the command and takes the renderer down again.
//
// Exit codes: 0 success, 1 a failure while rendering (unreadable media, a
// frame that failed, an output that cannot be written, a frame too large for
// the memory budget), 2 bad arguments, 130 cancelled with Ctrl-C (SIGINT),
// 143 cancelled with SIGTERM.
//
// Cancelling: SIGINT and SIGTERM are blocked in every thread and taken by a
// watcher thread of their own. The first sets the cancel flag that the
// render loop polls, which cancels the frames in flight and removes what was
// not written. Whatever the program is blocked in (a write to a pipe whose
// reader stalls, a frame that takes long to render), it ends within a
// second: when it has not ended by itself after a grace period, or at a
// second signal, the watcher makes the output complete (PendingOutput) and
// ends the process.

#include "BE/TimelineFile.h"
#include "CutlistInfo.h"
#include "DemoTimeline.h"
#include "FX/EffectCatalogue.h"
#include "MF/RenderableCutlistFactory.h"
#include "ML/RenderExecutors.h"
#include "ML/VideoRenderer.h"
#include "Options.h"
#include "PendingOutput.h"
#include "Progress.h"
#include "RenderJob.h"
#include "TX/TransitionCatalogue.h"

#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <exception>
#include <string>
#include <string_view>
#include <sys/syscall.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace
{

// Set by the signal watcher, read by the render loop.
std::atomic<bool> sCancelRequested{false};
// The signal that asked for the cancel; 0 before any.
std::atomic<int> sCancelSignal{0};
// Frames written so far, for the watcher's report.
std::atomic<std::int64_t> sFramesWritten{0};
// Set by whoever reports the cancel first (the program or the watcher).
std::atomic<bool> sCancelReported{false};

// After the first signal, the program has this long to end by itself.
constexpr long kCancelGraceNanoseconds = 500'000'000;

// 130 for SIGINT, 143 for SIGTERM: what a shell reports for a program
// ended by that signal.
int ExitCodeForSignal(int inSignal)
{
    return 128 + inSignal;
}

sigset_t CancelSignals()
{
    sigset_t signals;
    sigemptyset(&signals);
    sigaddset(&signals, SIGINT);
    sigaddset(&signals, SIGTERM);
    return signals;
}

void ReportCancel(std::int64_t inFramesWritten)
{
    if (sCancelReported.exchange(true))
        return;
    const std::string text = "vrender: " + vrender::FormatCancelled(inFramesWritten) + "\n";
    // Not through stdio: a thread blocked on stderr's lock must not hold this up.
    if (write(STDERR_FILENO, text.data(), text.size()) < 0)
        return;
}

[[noreturn]] void WatchSignals()
{
    const sigset_t signals = CancelSignals();
    int signal = 0;
    while (sigwait(&signals, &signal) != 0)
        continue;
    sCancelSignal.store(signal);
    sCancelRequested.store(true);
    // A second signal or the end of the grace period ends the process.
    timespec grace{0, kCancelGraceNanoseconds};
    siginfo_t info;
    while (sigtimedwait(&signals, &info, &grace) < 0 && errno == EINTR)
        continue;
    vrender::PendingOutput::Get().CleanUpForExit();
    ReportCancel(sFramesWritten.load());
    // The system call itself, not _exit: tools that intercept _exit (the
    // thread sanitizer) flush stdio first, which waits for good on a stream
    // whose write is blocked on a stalled pipe.
    syscall(SYS_exit_group, ExitCodeForSignal(signal));
    std::abort();
}

void InstallSignalHandlers()
{
    const sigset_t signals = CancelSignals();
    // Before any other thread starts, so that every thread inherits the mask.
    pthread_sigmask(SIG_BLOCK, &signals, nullptr);
    std::thread(WatchSignals).detach();
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

// Prints the timeline file inPath (the demo timeline when inPath is empty):
// its sequences, then the cutlist the factory builds of its main sequence.
// Each missing media file is warned of once.
int RunTimelineInfo(const std::string& inPath)
{
    const BE::TimelineLoadResult loaded =
        inPath.empty()
            ? BE::ParseTimeline(vrender::GetDemoTimelineText(), vrender::kDemoTimelineName, ".",
                                FX::CheckEffect, TX::CheckTransition)
            : BE::LoadTimelineFile(inPath, FX::CheckEffect, TX::CheckTransition);
    if (!loaded.Succeeded())
    {
        std::fprintf(stderr, "vrender: %s\n", loaded.mError.c_str());
        return 2;
    }
    for (const std::string& warning : loaded.mWarnings)
        std::fprintf(stderr, "vrender: warning: %s\n", warning.c_str());
    if (!inPath.empty())
        for (const std::string& missing : loaded.mMissingFiles)
            std::fprintf(stderr,
                         "vrender: warning: %s: media file not found; it plays as offline\n",
                         missing.c_str());
    std::string text = vrender::DescribeSequence(loaded.mMain);
    {
        RendererSession session;
        std::string error;
        const auto cutlist = vrender::BuildTimelineCutlist(loaded.mMain, error);
        if (!cutlist)
        {
            std::fprintf(stderr, "vrender: %s: %s\n",
                         inPath.empty() ? vrender::kDemoTimelineName : inPath.c_str(),
                         error.c_str());
            return 1;
        }
        text += "\n" + vrender::DescribeCutlist(*cutlist);
    }
    std::fwrite(text.data(), 1, text.size(), stdout);
    return 0;
}

int RunInfo(const vrender::RenderOptions& inOptions)
{
    if (!inOptions.mMedia.empty() || inOptions.mBuiltInTimeline)
        return RunTimelineInfo(inOptions.mMedia);
    RendererSession session;
    const auto cutlist = vrender::CreateExampleCutlist();
    const std::string text = vrender::DescribeCutlist(*cutlist);
    std::fwrite(text.data(), 1, text.size(), stdout);
    return 0;
}

int RunRender(const vrender::RenderOptions& inOptions, vrender::Command inCommand)
{
    const bool demo = inCommand == vrender::Command::kDemo;
    if (inOptions.mOutputKind == vrender::OutputKind::kY4MStream && isatty(STDOUT_FILENO))
    {
        std::fprintf(stderr, "vrender: standard output is a terminal; redirect the Y4M stream "
                             "(> out.y4m) or pipe it (| ffplay -)\n");
        return 2;
    }
    vrender::RenderEnvironment environment;
    environment.mShowProgress = !inOptions.mQuiet && isatty(STDERR_FILENO);
    environment.mCancel = &sCancelRequested;
    environment.mFramesWritten = &sFramesWritten;
    if (demo)
        std::fprintf(stderr, "vrender: rendering %s (vrender info --demo prints it)\n",
                     vrender::kDemoTimelineName);

    vrender::RenderOutcome outcome;
    {
        RendererSession session;
        outcome = inCommand == vrender::Command::kSource
                      ? vrender::RunRender(inOptions, environment)
                      : vrender::RunTimelineRender(inOptions, environment);
    }
    if (outcome.mExitCode == 130)
    {
        ReportCancel(outcome.mFramesWritten);
        const int signal = sCancelSignal.load();
        return signal == 0 ? 130 : ExitCodeForSignal(signal);
    }
    if (outcome.mExitCode != 0)
    {
        std::fprintf(stderr, "vrender: %s\n", outcome.mError.c_str());
        return outcome.mExitCode;
    }
    const std::string summary =
        vrender::FormatSummary(outcome.mFramesWritten, outcome.mSeconds, outcome.mWhere);
    std::fprintf(stderr, "%s\n", summary.c_str());
    if (demo && outcome.mFramesWritten > 0 &&
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
            return RunInfo(parsed.mOptions);
        case vrender::Command::kDemo:
        case vrender::Command::kRender:
        case vrender::Command::kSource:
            return RunRender(parsed.mOptions, parsed.mCommand);
        }
    }
    catch (const std::exception& inException)
    {
        std::fprintf(stderr, "vrender: internal error: %s\n", inException.what());
        return 1;
    }
    return 1;
}
