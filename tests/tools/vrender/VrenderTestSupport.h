#pragma once

// Shared by the vrender tests: a fresh scratch directory per test, reading a
// file back whole, and running the built program the way a user does, to
// its end or as a child that the test signals.

#include <chrono>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <spawn.h>
#include <string>
#include <sys/wait.h>
#include <thread>
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

    // Starts vrender with its standard output on inStdout and its standard
    // error in err.txt; answers its process id.
    pid_t Start(const std::vector<std::string>& inArguments, int inStdout) const
    {
        std::vector<std::string> words{VRENDER_BINARY};
        words.insert(words.end(), inArguments.begin(), inArguments.end());
        std::vector<char*> argv;
        for (std::string& word : words)
            argv.push_back(word.data());
        argv.push_back(nullptr);
        posix_spawn_file_actions_t actions;
        posix_spawn_file_actions_init(&actions);
        posix_spawn_file_actions_adddup2(&actions, inStdout, STDOUT_FILENO);
        posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, (mDirectory / "err.txt").c_str(),
                                         O_WRONLY | O_CREAT | O_TRUNC, 0644);
        pid_t pid = -1;
        EXPECT_EQ(posix_spawn(&pid, VRENDER_BINARY, &actions, nullptr, argv.data(), environ), 0);
        posix_spawn_file_actions_destroy(&actions);
        return pid;
    }

    // Polls inDone until it holds; false when it does not within the watchdog.
    template <typename Condition>
    static bool Await(Condition inDone)
    {
        const auto end = std::chrono::steady_clock::now() + kWatchdog;
        while (!inDone())
        {
            if (std::chrono::steady_clock::now() > end)
                return false;
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
        return true;
    }

    // The exit code of the child; -1 when it was ended by a signal, or when
    // it did not end within the watchdog (then it is killed).
    static int WaitForExit(pid_t inPid)
    {
        int status = 0;
        if (!Await([&] { return waitpid(inPid, &status, WNOHANG) == inPid; }))
        {
            kill(inPid, SIGKILL);
            waitpid(inPid, &status, 0);
            return -1;
        }
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }

    // A bound for "the child ended at all", far above any normal run.
    static constexpr std::chrono::seconds kWatchdog{20};

    fs::path mDirectory;
};

} // namespace vrendertest
