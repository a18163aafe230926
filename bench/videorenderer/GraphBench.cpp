// Costs of the node graph: sealing a large tree, finding the node at a time
// in a long cutlist, and naming a solid-colour frame by hash versus rendering it.

#include "ML/IMutableCutlist.h"
#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/RenderableNodeCommonImpl.h"
#include "ML/RenderableNodes.h"
#include "QRT/Allocated.h"

#include <cstdint>
#include <random>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>

namespace
{

using mvxmediatypes::TickTime;

// A plain node kind for building trees.
class BenchNode : public ML::RenderableNodeCommonImpl
{
public:
    QRT::ImmutableString GetNodeType() const override
    {
        return QRT::ImmutableString::CreateStatic("BenchNode");
    }

protected:
    ~BenchNode() = default;
};

const QRT::ImmutableString kKeys[3] = {QRT::ImmutableString::CreateStatic("Bench::Name"),
                                       QRT::ImmutableString::CreateStatic("Bench::Speed"),
                                       QRT::ImmutableString::CreateStatic("Bench::StartAsTicks")};

QRT::InterfaceRef<MF::IRenderableNode> SealedLeaf(int inIndex)
{
    auto node = QRT::Allocated<BenchNode>::CreateInstance();
    node->SetProperty(kKeys[0], "clip " + std::to_string(inIndex), true);
    node->SetTypedProperty(kKeys[1], 1.0 + inIndex * 0.001, true);
    node->SetTypedProperty(kKeys[2], TickTime::TicksToTime(inIndex * 23543520LL), true);
    node->MakeImmutable();
    return QRT::InterfaceRef<MF::IRenderableNode>(static_cast<MF::IRenderableNode*>(node.Get()));
}

// 100 parents of 99 leaves each under one root: 10,000 nodes, each built and
// sealed from its children's stored hashes.
void BM_SealTreeOf10000Nodes(benchmark::State& ioState)
{
    for (auto _ : ioState)
    {
        auto root = QRT::Allocated<BenchNode>::CreateInstance();
        int index = 0;
        for (int parentIndex = 0; parentIndex < 100; ++parentIndex)
        {
            auto parent = QRT::Allocated<BenchNode>::CreateInstance();
            for (int leaf = 0; leaf < 99; ++leaf)
                parent->AddInput(SealedLeaf(index++), TickTime::TicksToTime(leaf));
            parent->MakeImmutable();
            root->AddInput(QRT::InterfaceRef<MF::IRenderableNode>(
                               static_cast<MF::IRenderableNode*>(parent.Get())),
                           TickTime::TicksToTime(parentIndex));
        }
        root->MakeImmutable();
        benchmark::DoNotOptimize(root->GetNodeHash());
    }
    ioState.SetItemsProcessed(ioState.iterations() * 10000);
}
BENCHMARK(BM_SealTreeOf10000Nodes)->Unit(benchmark::kMillisecond);

void BM_GetNodeAtTimeIn100000Segments(benchmark::State& ioState)
{
    constexpr std::int64_t kSegmentTicks = 23543520;
    constexpr int kSegments = 100000;
    std::vector<QRT::InterfaceRef<MF::IRenderableNode>> nodes;
    for (int index = 0; index < 64; ++index)
        nodes.push_back(SealedLeaf(index));
    auto list = ML::CreateMutableCutlist(QRT::ImmutableString::CreateStatic("bench"));
    for (int index = 0; index < kSegments; ++index)
        list->AddSegment(TickTime::TicksToTime(index * kSegmentTicks),
                         TickTime::TicksToTime((index + 1) * kSegmentTicks),
                         TickTime::TicksToTime(index), nodes[index % nodes.size()]);
    list->MakeImmutable();

    std::mt19937_64 random(42);
    std::vector<MF::FrameTime> times(4096);
    for (MF::FrameTime& time : times)
        time = MF::FrameTime(TickTime::TicksToTime(
            static_cast<std::int64_t>(random() % (kSegments * kSegmentTicks))));
    std::size_t next = 0;
    QRT::InterfaceRef<MF::IRenderableNode> node;
    MF::FrameTime local;
    for (auto _ : ioState)
    {
        list->GetNodeAtTime(times[next++ & 4095], node, local);
        benchmark::DoNotOptimize(node.Get());
    }
    ioState.SetItemsProcessed(ioState.iterations());
}
BENCHMARK(BM_GetNodeAtTimeIn100000Segments);

ML::CutlistRenderParams Params1080()
{
    ML::CutlistRenderParams params;
    params.mWidth = 1920;
    params.mHeight = 1080;
    params.mPixelFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
    params.mPixelAspectRatio = mvxmediatypes::PixelAspectRatio(1, 1);
    return params;
}

QRT::InterfaceRef<ML::IRenderableNodeProducer>
SolidProducer(const ML::CutlistRenderParams& inParams)
{
    const QRT::InterfaceRef<ML::IRenderableNodeProducerProvider> provider(
        ML::CreateSolidColorNode(0xFF336699u));
    QRT::InterfaceRef<ML::IRenderableNodeProducer> producer;
    provider->GetProducer(producer, inParams.GetFrameTime(), inParams);
    return producer;
}

void BM_SolidColorFrameHash1080(benchmark::State& ioState)
{
    const ML::CutlistRenderParams params = Params1080();
    const auto producer = SolidProducer(params);
    QRT::Guid hash;
    for (auto _ : ioState)
    {
        producer->GetFrameHash(hash, params.GetFrameTime(), params);
        benchmark::DoNotOptimize(hash);
    }
}
BENCHMARK(BM_SolidColorFrameHash1080);

void BM_SolidColorProduceFrame1080(benchmark::State& ioState)
{
    const ML::CutlistRenderParams params = Params1080();
    const auto producer = SolidProducer(params);
    for (auto _ : ioState)
    {
        QRT::InterfaceRef<MF::IVideoFrame> frame;
        producer->ProduceFrame(params.GetFrameTime(), params, frame);
        benchmark::DoNotOptimize(frame.Get());
    }
}
BENCHMARK(BM_SolidColorProduceFrame1080)->Unit(benchmark::kMicrosecond);

} // namespace
