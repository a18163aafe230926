// Foundation hot paths: hashing byte runs into keys, copying references and
// immutable strings, taking a critical section, posting and pumping a message.

#include "QRT/Allocated.h"
#include "QRT/CriticalSection.h"
#include "QRT/Hash.h"
#include "QRT/ImmutableString.h"
#include "QRT/StationRegistry.h"
#include "QRT/StationUtils.h"
#include "QRT/UIThread.h"

#include <cstdint>
#include <string_view>
#include <vector>

#include <benchmark/benchmark.h>

namespace
{

class IBenchObject : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{c2a1f0e4-5b6d-4e7f-8091-a2b3c4d5e6f7}");
    virtual int Value() const = 0;
};

class BenchObject : public QRT::Implements<IBenchObject>
{
public:
    int Value() const override { return 1; }
};

struct BenchMessage
{
    static constexpr std::string_view kMessageTypeName = "QRTBench::BenchMessage";
    int mValue = 0;
};

void BM_MixInData(benchmark::State& ioState)
{
    const size_t size = static_cast<size_t>(ioState.range(0));
    std::vector<uint8_t> data(size);
    for (size_t i = 0; i < size; ++i)
        data[i] = static_cast<uint8_t>(i);
    QRT::HashValue hash;
    for (auto _ : ioState)
    {
        QRT::MixHash::MixInData(hash, data.data(), data.size());
        benchmark::DoNotOptimize(hash);
    }
    ioState.SetBytesProcessed(static_cast<int64_t>(ioState.iterations() * size));
}
BENCHMARK(BM_MixInData)->Arg(16)->Arg(1024)->Arg(4096);

void BM_InterfaceRefCopy(benchmark::State& ioState)
{
    const QRT::InterfaceRef<IBenchObject> ref = QRT::Allocated<BenchObject>::Create<IBenchObject>();
    for (auto _ : ioState)
    {
        QRT::InterfaceRef<IBenchObject> copy = ref;
        benchmark::DoNotOptimize(copy);
    }
}
BENCHMARK(BM_InterfaceRefCopy);

void BM_ImmutableStringCopyStatic(benchmark::State& ioState)
{
    const QRT::ImmutableString text = QRT::ImmutableString::CreateStatic("ML.Opacity");
    for (auto _ : ioState)
    {
        QRT::ImmutableString copy = text;
        benchmark::DoNotOptimize(copy);
    }
}
BENCHMARK(BM_ImmutableStringCopyStatic);

void BM_ImmutableStringCopyDynamic(benchmark::State& ioState)
{
    const QRT::ImmutableString text = QRT::ImmutableString::CreateDynamic("a cutlist name");
    for (auto _ : ioState)
    {
        QRT::ImmutableString copy = text;
        benchmark::DoNotOptimize(copy);
    }
}
BENCHMARK(BM_ImmutableStringCopyDynamic);

void BM_ImmutableStringCompareEqual(benchmark::State& ioState)
{
    const QRT::ImmutableString left = QRT::ImmutableString::CreateDynamic("KX.VNTR Geometry");
    const QRT::ImmutableString right = QRT::ImmutableString::CreateDynamic("KX.VNTR Geometry");
    for (auto _ : ioState)
        benchmark::DoNotOptimize(left.Compare(right));
}
BENCHMARK(BM_ImmutableStringCompareEqual);

void BM_CriticalSectionLock(benchmark::State& ioState)
{
    QRT::CriticalSection section;
    for (auto _ : ioState)
    {
        QRT::CriticalSectionLock lock(section, "BM_CriticalSectionLock");
        benchmark::ClobberMemory();
    }
}
BENCHMARK(BM_CriticalSectionLock);

// Post one message and pump it on this thread: clone, queue, deliver, free.
void BM_PostAndPump(benchmark::State& ioState)
{
    int received = 0;
    const QRT::ImmutableString station = QRT::StationRegistry::RegisterUniqueStation(
        [&received](const QRT::Message&) { ++received; });
    const QRT::MessageImpl<BenchMessage> message(BenchMessage{1});
    for (auto _ : ioState)
    {
        QRT::StationUtils::PostMessageToUIThread(station, message);
        QRT::UIThread::PumpMessages();
    }
    QRT::StationRegistry::DisposeStation(station);
    benchmark::DoNotOptimize(received);
}
BENCHMARK(BM_PostAndPump);

} // namespace
