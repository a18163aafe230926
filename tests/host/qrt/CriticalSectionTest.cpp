#include "QRT/CriticalSection.h"

#include "mvxcore/config/Error.h"

#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

// Runs inBody on another thread and waits for it.
template <class Body>
void OnOtherThread(Body inBody)
{
    std::thread(inBody).join();
}

TEST(CriticalSectionTest, LockExcludesOtherThreads)
{
    QRT::CriticalSection section;
    int64_t counter = 0; // guarded by section
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
    {
        threads.emplace_back(
            [&]
            {
                for (int i = 0; i < 20000; ++i)
                {
                    QRT::CriticalSectionLock lock(section, "CriticalSectionTest::Increment");
                    // A non-atomic read-modify-write loses updates without exclusion.
                    const int64_t value = counter;
                    counter = value + 1;
                }
            });
    }
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(counter, 80000);
}

TEST(CriticalSectionTest, LabelIsKeptWhileHeldAndUnlockRelockLetOthersIn)
{
    QRT::CriticalSection section;
    {
        QRT::CriticalSectionLock lock(section, "RenderFrameQueue::OnAcceleratedRenderCompletion");
        EXPECT_STREQ(lock.GetLabel(), "RenderFrameQueue::OnAcceleratedRenderCompletion");
        EXPECT_STREQ(section.GetOwnerLabel(), "RenderFrameQueue::OnAcceleratedRenderCompletion");
        EXPECT_TRUE(section.IsLockedByCurrentThread());
    }
    EXPECT_EQ(section.GetOwnerLabel(), nullptr);
    EXPECT_FALSE(section.IsLockedByCurrentThread());

    QRT::CriticalSectionLock lock(section, "outer");
    lock.Unlock();
    EXPECT_FALSE(lock.IsLocked());
    bool taken = false;
    OnOtherThread(
        [&]
        {
            taken = section.TryLock("other");
            if (taken)
                section.Unlock();
        });
    EXPECT_TRUE(taken);
    lock.Relock();
    EXPECT_TRUE(lock.IsLocked());
    EXPECT_STREQ(section.GetOwnerLabel(), "outer");
    OnOtherThread([&] { taken = section.TryLock(); });
    EXPECT_FALSE(taken);
}

TEST(CriticalSectionTest, RelockingOrUnlockingWithoutHoldingIsAContractViolation)
{
    QRT::CriticalSection section;
    EXPECT_THROW(section.Unlock(), mvxcore::config::Error);
    QRT::CriticalSectionLock lock(section);
    EXPECT_THROW(section.Lock(), mvxcore::config::Error);
    EXPECT_THROW(section.TryLock(), mvxcore::config::Error);
    OnOtherThread(
        [&]
        {
            try
            {
                section.Unlock();
                ADD_FAILURE() << "a foreign unlock was accepted";
            }
            catch (const mvxcore::config::Error& inError)
            {
                EXPECT_EQ(inError.GetExpression(), "IsLockedByCurrentThread()");
            }
        });
    // The failed attempts left the section held by this thread.
    EXPECT_TRUE(section.IsLockedByCurrentThread());
    lock.Unlock();
    EXPECT_THROW(lock.Unlock(), mvxcore::config::Error);
}

} // namespace
