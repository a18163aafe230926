// The module's start-up and shutdown.
//
// The host brings the module up with VideoRenderer::Initialize and down with
// the balancing VideoRenderer::Shutdown. Both are counted and serialise on the
// module lock; only the call that takes the count from 0 to 1 wires the
// module into the host, and only the call that takes it from 1 to 0 unwires
// it. The suite support library is initialised and shut down on every call,
// so its own count follows the module's calls one for one.
//
// Shutdown runs on the host's thread and waits, under the module lock, for
// the render and prefetch executors to finish their running tasks: a task of
// the module (a render callback among them) must not call Initialize or
// Shutdown.

#include "ML/VideoRenderer.h"

#include "BrambleSupport/BrambleSupport.h"
#include "ImporterHost/ImporterHost.h"
#include "MF/RenderableCutlistFactory.h"
#include "ML/RenderExecutors.h"
#include "ML/RenderFrameQueue.h"
#include "QRT/CriticalSection.h"
#include "QRT/InterfaceRef.h"
#include "factory/CutlistFactory.h"
#include "module/ModuleInternals.h"
#include "mvxcore/debug/Contract.h"
#include "prefetch/MediaNodePrefetcher.h"
#include "prefetch/VideoSourcePrefetcher.h"

#include <cstdint>

namespace ML
{
namespace
{

// The module lock guards sInitializationCount and the global render queue.
QRT::CriticalSection sModuleLock;
std::int32_t sInitializationCount = 0;

// The global render queue: set by the first Initialize, shut down and
// released by the last Shutdown. Never destroyed with the library's statics,
// so that a host that ends without Shutdown does not tear the queue down
// while the executors it uses are being destroyed.
QRT::InterfaceRef<RenderFrameQueue>& GetGlobalRenderQueueLocked()
{
    static auto* sRenderQueue = new QRT::InterfaceRef<RenderFrameQueue>();
    return *sRenderQueue;
}

// Steps of the first Initialize, in order. The module lock is held.
void BringModuleUpLocked()
{
    // The shared executors are the host's; a previous Shutdown of this module
    // stopped the four of them (the render queue stops the two render
    // executors, the prefetch flush the two prefetch executors). Replace
    // every stopped or missing one so the module works again.
    Foundation::StartUp();

    // Step: register the "RenderFrame" class (kRenderFrameClassID) with the
    // class factory. Joins start-up with the render-frame object.

    ImporterHost::Initialize();

    QRT::InterfaceRef<RenderFrameQueue>& globalQueue = GetGlobalRenderQueueLocked();
    globalQueue = RenderFrameQueue::Create();
    // A queue that is still shutting down was kept alive by a reference from
    // before the last Shutdown: it refuses every render.
    MVX_ASSERT(!IsRenderModuleShuttingDown(),
               "The render queue of a previous session is still referenced; renders will be "
               "refused.");

    // Step: register the "PluginVideoRenderer" class
    // (kPluginVideoRendererClassID) with the class factory. Joins start-up
    // with the plug-in video renderer.

    // Steps: the eight suite families, in this order, each through
    // ModuleInternals::RegisterSuiteFamily (a failure ends start-up with an
    // output-contract violation): "Orvel Stock Image Suite" 1; "Orvel Clip
    // Render Suite" 1, 2, 3; "Strata Sequence Render Suite" 2, 3, 4; "Orvel
    // RollCrawl Suite" 1; "Strata Video Segment Suite" 2, 3, 4, 5 (after
    // creating its registry); "Strata Video Segment Render Suite" 3; "Strata
    // Accelerated Render Invocation Suite" 1, 2 (after creating its
    // registry); "Strata Smart Rendering Suite" 1. They join start-up with
    // the suites.

    // Step: install the four legacy video callbacks into the host's legacy
    // plug-in table when its video-callbacks block is present. Joins start-up
    // with the legacy callbacks.

    // Every renderable cutlist of the host is built by the module's factory
    // from here on, until the last Shutdown withdraws it.
    MF::SetCutlistFactory(CreateCutlistFactory());
}

// Steps of the last Shutdown, in order. The module lock is held.
void TakeModuleDownLocked()
{
    MF::SetCutlistFactory({});

    // Step: release the cached accelerated sequence renderer. Joins shutdown
    // with the accelerated sequence renderer.

    // Prefetching first, so that no read is started for a request that the
    // queue is about to drop: the media-node key table, then the queued
    // reads and both prefetch executors.
    FlushMediaNodePrefetchRegistry();
    FlushVideoSourcePrefetcher();

    QRT::InterfaceRef<RenderFrameQueue>& globalQueue = GetGlobalRenderQueueLocked();
    // An empty reference throws QRT::NullInterfaceException here.
    globalQueue->Shutdown();
    // The queue singleton goes with its last reference; the next Initialize
    // constructs a fresh one.
    globalQueue.Reset();

    // Step: destroy the video segment suite registry, then the accelerated
    // render invocation suite registry. Joins shutdown with the suites.

    ImporterHost::Shutdown();
}

} // namespace

int VideoRenderer::Initialize()
{
    BrambleSupport::Initialize();
    QRT::CriticalSectionLock lock(sModuleLock, "VideoRenderer::Initialize");
    if (sInitializationCount == 0)
        BringModuleUpLocked();
    ++sInitializationCount;
    return 0;
}

int VideoRenderer::Shutdown()
{
    QRT::CriticalSectionLock lock(sModuleLock, "VideoRenderer::Shutdown");
    if (sInitializationCount == 0)
    {
        // Nothing to balance: leave the count at 0 (a negative count would
        // keep every later Initialize from bringing the module up) and do not
        // take a count of the suite support library that another user holds.
        MVX_ASSERT(sInitializationCount > 0,
                   "VideoRenderer::Shutdown without a matching Initialize.");
        return 0;
    }
    if (sInitializationCount-- == 1)
        TakeModuleDownLocked();
    BrambleSupport::Shutdown();
    return 0;
}

void VideoRenderer::EnableAcceleratedRendering()
{
    // Registers the accelerated renderer module factory under the module type
    // {1B5BC335-92E5-4479-BD38-D18BEDEC69B2} with the plug-in support
    // library's module factory registry. Nothing to register until the
    // accelerated renderer modules join the module; no state records the call.
}

namespace ModuleInternals
{

QRT::Result RegisterSuiteVersions(const char* inName,
                                  std::initializer_list<std::int32_t> inVersions,
                                  const void* inTable)
{
    QRT::Result result = QRT::kResult_Success;
    for (const std::int32_t version : inVersions)
        result = BrambleSupport::RegisterSuite(inName, version, inTable);
    return result;
}

void RegisterSuiteFamily(const char* inName, std::initializer_list<std::int32_t> inVersions,
                         const void* inTable)
{
    const QRT::Result result = RegisterSuiteVersions(inName, inVersions, inTable);
    MVX_OUTPUT_CONTRACT(result == 0);
}

std::int32_t GetInitializationCount()
{
    QRT::CriticalSectionLock lock(sModuleLock, "ModuleInternals::GetInitializationCount");
    return sInitializationCount;
}

} // namespace ModuleInternals
} // namespace ML
