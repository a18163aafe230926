#pragma once

// Small file helpers shared by the file sources: the identity of a file for
// frame keys, and positional reads that never crash on short files.

#include <cstddef>
#include <cstdint>
#include <string>

namespace BE::detail
{

struct FileIdentity
{
    // The absolute, resolved path.
    std::string mPath;
    std::uint64_t mSize = 0;
    std::int64_t mModifiedNanoseconds = 0;

    // "<path>|<size>|<mtime ns>": names the file's content for frame keys.
    std::string ToText() const;
};

// Fills outIdentity for an open file descriptor and its path. False when the
// descriptor cannot be examined or is not a regular file.
bool GetFileIdentity(int inDescriptor, const std::string& inPath, FileIdentity& outIdentity);

// Reads exactly inSize bytes at inOffset (retrying short and interrupted
// reads). Answers the number of bytes read; less than inSize means the file
// ended or failed there.
std::size_t ReadAt(int inDescriptor, std::uint64_t inOffset, void* outData, std::size_t inSize);

// The lower-case file name extension without the dot ("" when none).
std::string GetLowerCaseExtension(const std::string& inPath);

// strerror text of errno, thread-safe.
std::string DescribeErrno(int inError);

} // namespace BE::detail
