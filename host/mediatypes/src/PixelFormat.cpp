#include "mvxmediatypes/PixelFormat.h"

#include <algorithm>
#include <array>

namespace mvxmediatypes
{

namespace
{

struct CatalogueEntry
{
    PixelFormat mFormat;
    std::string_view mName;
};

constexpr std::array<CatalogueEntry, 14> kCatalogue = {{
    {kPixelFormat_BGRA_4444_8u, "BGRA_4444_8u"},
    {kPixelFormat_BGRA_4444_16u, "BGRA_4444_16u"},
    {kPixelFormat_BGRA_4444_16f, "BGRA_4444_16f"},
    {kPixelFormat_BGRA_4444_32f, "BGRA_4444_32f"},
    {kPixelFormat_BGRP_4444_32f_Linear, "BGRP_4444_32f_Linear"},
    {kPixelFormat_VUYA_4444_8u, "VUYA_4444_8u"},
    {kPixelFormat_VUYA_4444_32f, "VUYA_4444_32f"},
    {kPixelFormat_YUYV_422_8u, "YUYV_422_8u"},
    {kPixelFormat_YUYV_422_8u_Fields, "YUYV_422_8u_Fields"},
    {kPixelFormat_YUYV_422_8u_HalfWidthFields, "YUYV_422_8u_HalfWidthFields"},
    {kPixelFormat_MJPG_422_Compressed, "MJPG_422_Compressed"},
    {kPixelFormat_YUV_420_8u_Planar, "YUV_420_8u_Planar"},
    {kPixelFormat_Any, "Any"},
    {kPixelFormat_Invalid, "Invalid"},
}};

constexpr std::array<PixelFormat, kCatalogue.size()> MakeFormatList()
{
    std::array<PixelFormat, kCatalogue.size()> formats{};
    for (std::size_t i = 0; i < kCatalogue.size(); ++i)
        formats[i] = kCatalogue[i].mFormat;
    return formats;
}

constexpr std::array<PixelFormat, kCatalogue.size()> kFormatList = MakeFormatList();

bool Holds(const std::vector<PixelFormat>& inList, PixelFormat inFormat)
{
    return std::find(inList.begin(), inList.end(), inFormat) != inList.end();
}

PixelFormat FirstConcrete(const std::vector<PixelFormat>& inList)
{
    for (const PixelFormat format : inList)
        if (format.IsValid())
            return format;
    return kPixelFormat_Invalid;
}

std::uint32_t Differs(bool inLeft, bool inRight)
{
    return inLeft != inRight ? 1 : 0;
}

using Rank = std::array<std::uint32_t, 11>;

// Smaller is closer; compared lexicographically in the order of the documented rule.
Rank RankCandidate(PixelFormat inRequested, PixelFormat inCandidate, std::uint32_t inQuality)
{
    const std::uint32_t wanted = inRequested.GetBitDepth();
    const std::uint32_t depth = inCandidate.GetBitDepth();
    std::uint32_t depthRank = 0;
    std::uint32_t depthDistance = 0;
    if (inQuality >= kRenderQuality_Medium)
    {
        // Equal depth, then the shallowest deeper one, then the deepest shallower one.
        depthRank = depth == wanted ? 0 : (depth > wanted ? 1 : 2);
        depthDistance = depth > wanted ? depth - wanted : wanted - depth;
    }
    else
    {
        // Nearest either way; the shallower wins a tie because it is cheaper.
        depthRank = depth > wanted ? depth - wanted : wanted - depth;
        depthDistance = depth;
    }
    return Rank{
        Differs(inRequested.IsCompressed(), inCandidate.IsCompressed()),
        // Planar frames cannot stand in for packed ones, nor the reverse.
        Differs(inRequested.IsPlanar(), inCandidate.IsPlanar()),
        Differs(inRequested.IsYUV(), inCandidate.IsYUV()),
        depthRank,
        depthDistance,
        Differs(inRequested.HasAlpha(), inCandidate.HasAlpha()),
        Differs(inRequested.IsPremultiplied(), inCandidate.IsPremultiplied()),
        Differs(inRequested.IsLinear(), inCandidate.IsLinear()),
        Differs(inRequested.IsFloat(), inCandidate.IsFloat()),
        inRequested.GetChroma() != inCandidate.GetChroma() ? 1u : 0u,
        inRequested.GetFieldLayout() != inCandidate.GetFieldLayout() ? 1u : 0u,
    };
}

} // namespace

std::span<const PixelFormat> GetPixelFormatCatalogue()
{
    return kFormatList;
}

std::string_view GetPixelFormatName(PixelFormat inFormat)
{
    for (const CatalogueEntry& entry : kCatalogue)
        if (entry.mFormat == inFormat)
            return entry.mName;
    return {};
}

std::optional<PixelFormat> PixelFormatFromName(std::string_view inName)
{
    for (const CatalogueEntry& entry : kCatalogue)
        if (entry.mName == inName)
            return entry.mFormat;
    return std::nullopt;
}

PixelFormat SelectNearestPixelFormat(PixelFormat inRequested,
                                     const std::vector<PixelFormat>& inAcceptable,
                                     std::uint32_t inQuality)
{
    if (inAcceptable.empty() || inRequested == kPixelFormat_Invalid)
        return kPixelFormat_Invalid;
    if (Holds(inAcceptable, inRequested) && inRequested.IsValid())
        return inRequested;
    if (inRequested.IsAny())
        return FirstConcrete(inAcceptable);
    if (Holds(inAcceptable, kPixelFormat_Any))
        return inRequested;

    PixelFormat best = kPixelFormat_Invalid;
    Rank bestRank{};
    for (const PixelFormat candidate : inAcceptable)
    {
        if (!candidate.IsValid())
            continue;
        const Rank rank = RankCandidate(inRequested, candidate, inQuality);
        // Strictly better only, so that the earlier of two equal candidates stays.
        if (best == kPixelFormat_Invalid || rank < bestRank)
        {
            best = candidate;
            bestRank = rank;
        }
    }
    return best;
}

PixelFormat SelectNearestPixelFormat(PixelFormat inRequested,
                                     const std::vector<PixelFormat>& inAcceptable)
{
    return SelectNearestPixelFormat(inRequested, inAcceptable, kRenderQuality_Max);
}

PixelFormat SelectNearestPixelFormat(const std::vector<PixelFormat>& inRequested,
                                     PixelFormat inFallback,
                                     const std::vector<PixelFormat>& inAvailable,
                                     std::uint32_t inQuality, bool inAllowNearest)
{
    const bool availableHoldsAny = Holds(inAvailable, kPixelFormat_Any);
    const bool fallbackAvailable =
        inFallback.IsValid() && (availableHoldsAny || Holds(inAvailable, inFallback));

    for (const PixelFormat requested : inRequested)
    {
        if (requested.IsValid() && Holds(inAvailable, requested))
            return requested;
        // A caller that asks for "any format" takes the format in hand, else the first offered.
        if (requested.IsAny())
        {
            if (fallbackAvailable)
                return inFallback;
            const PixelFormat offered = FirstConcrete(inAvailable);
            if (offered.IsValid())
                return offered;
        }
    }

    const PixelFormat firstRequested = FirstConcrete(inRequested);
    if (availableHoldsAny)
    {
        if (inAllowNearest && inFallback.IsValid())
            return inFallback;
        if (firstRequested.IsValid())
            return firstRequested;
        return inFallback;
    }
    if (!inAllowNearest)
        return inFallback;
    if (fallbackAvailable)
        return inFallback;
    if (firstRequested.IsValid())
    {
        const PixelFormat nearest =
            SelectNearestPixelFormat(firstRequested, inAvailable, inQuality);
        if (nearest != kPixelFormat_Invalid)
            return nearest;
    }
    return inFallback;
}

} // namespace mvxmediatypes
