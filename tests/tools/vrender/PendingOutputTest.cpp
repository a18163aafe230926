// What a forced exit leaves: temporary files removed, committed ones kept,
// file streams flushed, and no temporary file created afterwards. The clean
// up runs in a child process, as it ends the process it runs in.

#include "PendingOutput.h"

#include "VrenderTestSupport.h"

#include <gtest/gtest.h>

namespace
{

namespace fs = std::filesystem;
using PendingOutputTest = vrendertest::ScratchDirectoryTest;

TEST_F(PendingOutputTest, CleaningUpForExitLeavesOnlyCompleteOutput)
{
    // Forked, not run again: the child writes into this test's directory.
    GTEST_FLAG_SET(death_test_style, "fast");
    const fs::path partial = mDirectory / "f_1.png.part";
    const fs::path renamed = mDirectory / "f_0.png.part";
    const fs::path stream = mDirectory / "clip.y4m";
    const auto cleanUp = [&]
    {
        vrender::PendingOutput& pending = vrender::PendingOutput::Get();
        for (const fs::path& path : {partial, renamed})
        {
            pending.AddTemporaryFile(path.string());
            std::ofstream(path) << "pixels";
        }
        // Renamed into place: the name now holds a complete frame.
        pending.RemoveTemporaryFile(renamed.string());
        std::FILE* file = std::fopen(stream.c_str(), "wb");
        std::fputs("FRAME\n", file);
        pending.AddStream(file);
        pending.CleanUpForExit();
        _exit(pending.AddTemporaryFile((mDirectory / "late.part").string()) ? 1 : 0);
    };
    EXPECT_EXIT(cleanUp(), ::testing::ExitedWithCode(0), "");
    EXPECT_FALSE(fs::exists(partial));
    EXPECT_EQ(vrendertest::ReadText(renamed), "pixels");
    EXPECT_EQ(vrendertest::ReadText(stream), "FRAME\n");
}

} // namespace
