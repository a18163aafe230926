#pragma once

// vrender::PendingOutput: the output that is not yet in its final state,
// for a process that must end without waiting for its writers (a cancel
// whose frames in flight do not finish in time).
//
// Writers register a temporary file before they create it and withdraw it
// once it is renamed into place or removed; a file stream they write to is
// registered while it is open. CleanUpForExit removes every temporary file
// and flushes every stream, so that what remains on disk is complete:
// committed frames under their final names and Y4M files that end after
// their last committed frame (stdio writes a frame under the stream's lock,
// which the flush waits for and then keeps, so that no later frame starts).
// Only streams on regular files are flushed: a pipe whose reader stalls
// would hold the flush for good.
//
// One process-wide instance, never destroyed (a forced exit may come while
// static objects are being torn down). All operations take one mutex.

#include <chrono>
#include <cstdio>
#include <mutex>
#include <set>
#include <string>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

namespace vrender
{

class PendingOutput
{
public:
    static PendingOutput& Get()
    {
        static PendingOutput* const sInstance = new PendingOutput;
        return *sInstance;
    }

    // False when the process is ending: the file must not be created.
    bool AddTemporaryFile(const std::string& inPath)
    {
        std::lock_guard lock(mMutex);
        if (mEnding)
            return false;
        mTemporaryFiles.insert(inPath);
        return true;
    }

    void RemoveTemporaryFile(const std::string& inPath)
    {
        std::lock_guard lock(mMutex);
        mTemporaryFiles.erase(inPath);
    }

    void AddStream(std::FILE* inStream)
    {
        struct stat info = {};
        if (fstat(fileno(inStream), &info) != 0 || !S_ISREG(info.st_mode))
            return;
        std::lock_guard lock(mMutex);
        mStreams.insert(inStream);
    }

    void RemoveStream(std::FILE* inStream)
    {
        std::lock_guard lock(mMutex);
        mStreams.erase(inStream);
    }

    // Flushes the streams and removes the temporary files; no file is
    // registered afterwards and the streams stay locked, so the caller ends
    // the process next. A writer between registering a file and
    // creating it may still create it, so the files are removed twice, the
    // second time after the writers have had a moment to get there.
    void CleanUpForExit()
    {
        {
            std::lock_guard lock(mMutex);
            mEnding = true;
            for (std::FILE* stream : mStreams)
            {
                flockfile(stream);
                fflush_unlocked(stream);
            }
            RemoveFilesLocked();
        }
        std::this_thread::sleep_for(kLateCreation);
        std::lock_guard lock(mMutex);
        RemoveFilesLocked();
    }

private:
    static constexpr std::chrono::milliseconds kLateCreation{20};

    PendingOutput() = default;

    void RemoveFilesLocked()
    {
        for (const std::string& path : mTemporaryFiles)
            unlink(path.c_str());
    }

    // Guards mTemporaryFiles, mStreams and mEnding.
    std::mutex mMutex;
    std::set<std::string> mTemporaryFiles;
    std::set<std::FILE*> mStreams;
    bool mEnding = false;
};

} // namespace vrender
