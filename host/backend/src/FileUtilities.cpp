#include "FileUtilities.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <sys/stat.h>
#include <unistd.h>

namespace BE::detail
{

std::string FileIdentity::ToText() const
{
    return mPath + "|" + std::to_string(mSize) + "|" + std::to_string(mModifiedNanoseconds);
}

bool GetFileIdentity(int inDescriptor, const std::string& inPath, FileIdentity& outIdentity)
{
    struct stat info = {};
    if (fstat(inDescriptor, &info) != 0 || !S_ISREG(info.st_mode))
        return false;
    std::unique_ptr<char, decltype(&std::free)> resolved(realpath(inPath.c_str(), nullptr),
                                                         &std::free);
    outIdentity.mPath = resolved ? std::string(resolved.get()) : inPath;
    outIdentity.mSize = static_cast<std::uint64_t>(info.st_size);
    outIdentity.mModifiedNanoseconds =
        static_cast<std::int64_t>(info.st_mtim.tv_sec) * 1'000'000'000 + info.st_mtim.tv_nsec;
    return true;
}

std::size_t ReadAt(int inDescriptor, std::uint64_t inOffset, void* outData, std::size_t inSize)
{
    auto* data = static_cast<std::uint8_t*>(outData);
    std::size_t done = 0;
    while (done < inSize)
    {
        const ssize_t count =
            pread(inDescriptor, data + done, inSize - done, static_cast<off_t>(inOffset + done));
        if (count < 0 && errno == EINTR)
            continue;
        if (count <= 0)
            break;
        done += static_cast<std::size_t>(count);
    }
    return done;
}

std::string GetLowerCaseExtension(const std::string& inPath)
{
    const std::size_t slash = inPath.find_last_of('/');
    const std::size_t dot = inPath.find_last_of('.');
    if (dot == std::string::npos || (slash != std::string::npos && dot < slash))
        return {};
    std::string extension = inPath.substr(dot + 1);
    for (char& character : extension)
        if (character >= 'A' && character <= 'Z')
            character = static_cast<char>(character - 'A' + 'a');
    return extension;
}

std::string DescribeErrno(int inError)
{
    char buffer[256] = {};
    // The GNU variant answers a pointer that may or may not be the buffer.
    const char* text = strerror_r(inError, buffer, sizeof(buffer));
    return text ? std::string(text) : std::string("error ") + std::to_string(inError);
}

} // namespace BE::detail
