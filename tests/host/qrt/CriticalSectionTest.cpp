#include "QRT/CriticalSection.h"

#include "ContractExpect.h"

#include <thread>

#include <gtest/gtest.h>

namespace
{

// Runs inBody on another thread and waits for it.
template <class Body>
void OnOtherThread(Body inBody)
{
    std::thread(inBody).join();
}

TEST(CriticalSectionTest, LabelIsKeptWhileHeldUnlockRelockLetOthersInAndMisuseBreaksContracts)
{
    QRT::CriticalSection section;
    {
        QRT::CriticalSectionLock lock(section, "RenderFrameQueue::OnCompletion");
        EXPECT_STREQ(lock.GetLabel(), "RenderFrameQueue::OnCompletion");
        EXPECT_STREQ(section.GetOwnerLabel(), "RenderFrameQueue::OnCompletion");
    }
    EXPECT_EQ(section.GetOwnerLabel(), nullptr);
    EXPECT_FALSE(section.IsLockedByCurrentThread());

    QRT::CriticalSectionLock lock(section, "outer");
    lock.Unlock();
    bool taken = false;
    OnOtherThread([&] { taken = section.TryLock("other") && (section.Unlock(), true); });
    EXPECT_TRUE(taken);
    lock.Relock();
    EXPECT_TRUE(lock.IsLocked() && section.IsLockedByCurrentThread());
    EXPECT_STREQ(section.GetOwnerLabel(), "outer");
    OnOtherThread([&] { taken = section.TryLock(); });
    EXPECT_FALSE(taken);
    // Relocking or unlocking without holding is a contract violation.
    lock.Unlock();
    EXPECT_INPUT_CONTRACT(section.Unlock(), "IsLockedByCurrentThread()");
    lock.Relock();
    EXPECT_INPUT_CONTRACT(section.Lock(), "!IsLockedByCurrentThread()");
    EXPECT_INPUT_CONTRACT(section.TryLock(), "!IsLockedByCurrentThread()");
    EXPECT_INPUT_CONTRACT(lock.Relock(), "!mLocked");
    OnOtherThread([&] { EXPECT_INPUT_CONTRACT(section.Unlock(), "IsLockedByCurrentThread()"); });
    // The failed attempts left the section held by this thread.
    EXPECT_TRUE(section.IsLockedByCurrentThread());
    lock.Unlock();
    EXPECT_INPUT_CONTRACT(lock.Unlock(), "mLocked");
}

} // namespace
