#include "ML/VideoRenderer.h"
#include "module/ModuleInternals.h"

#include <cstdint>
#include <vector>

#include <gtest/gtest.h>

namespace
{

// Taken while the test program starts, before any test can move the counter:
// the first two identifiers of the loaded module.
const unsigned int kFirstIDAfterLoad = ML::GetNextRequestID();
const unsigned int kSecondIDAfterLoad = ML::GetNextRequestID();

TEST(RequestIDTest, IdentifiersStartAtTwoAndTheWrapSkipsZero)
{
    EXPECT_EQ(kFirstIDAfterLoad, 2u);
    EXPECT_EQ(kSecondIDAfterLoad, 3u);
    // 0 means "no request": past the top the counter goes on at 1, also from
    // a counter left at the top.
    const std::pair<unsigned int, std::vector<unsigned int>> cases[] = {
        {0xFFFFFFFEu, {0xFFFFFFFFu, 1, 2}}, {0xFFFFFFFFu, {1}}};
    for (const auto& [last, ids] : cases)
    {
        ML::ModuleInternals::SetLastRequestID(last);
        for (unsigned int expected : ids)
            EXPECT_EQ(ML::GetNextRequestID(), expected) << "after " << last;
    }
}

TEST(AcceleratedRendererIDTest, NilUntilSetThenTheLastValueSet)
{
    // The only case of the program that sets the identifier.
    EXPECT_TRUE(ML::GetCurrentAcceleratedSequenceRendererID().IsNil());
    const mvxcore::utility::Guid id("{1b5bc335-92e5-4479-bd38-d18bedec69b2}");
    ML::SetCurrentAcceleratedSequenceRendererID(id);
    EXPECT_EQ(ML::GetCurrentAcceleratedSequenceRendererID(), id);
    ML::SetCurrentAcceleratedSequenceRendererID(mvxcore::utility::Guid());
}

} // namespace
