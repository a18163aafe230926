#pragma once

// Shared by the vrender tests: a fresh scratch directory per test, reading a
// file back whole, and running the built program the way a user does.

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

namespace vrendertest
{

namespace fs = std::filesystem;

inline std::string ReadText(const fs::path& inPath)
{
    std::ifstream stream(inPath, std::ios::binary);
    return {std::istreambuf_iterator<char>(stream), std::istreambuf_iterator<char>()};
}

struct RunResult
{
    int mExitCode = -1;
    std::string mOut;
    std::string mErr;
};

class ScratchDirectoryTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        const auto* test = ::testing::UnitTest::GetInstance()->current_test_info();
        mDirectory = fs::temp_directory_path() / ("vrender_" + std::to_string(getpid()) + "_" +
                                                  test->test_suite_name() + "_" + test->name());
        fs::remove_all(mDirectory);
        fs::create_directories(mDirectory);
    }
    void TearDown() override { fs::remove_all(mDirectory); }

    // Runs vrender with each argument as one word; answers the exit code and
    // what it wrote to standard output and standard error.
    RunResult Run(const std::vector<std::string>& inArguments) const
    {
        std::string command = std::string("'") + VRENDER_BINARY + "'";
        for (const std::string& argument : inArguments)
            command += " '" + argument + "'";
        const fs::path out = mDirectory / "out.txt";
        const fs::path err = mDirectory / "err.txt";
        command += " > '" + out.string() + "' 2> '" + err.string() + "'";
        const int status = std::system(command.c_str());
        return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, ReadText(out), ReadText(err)};
    }

    fs::path mDirectory;
};

} // namespace vrendertest
