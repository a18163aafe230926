#pragma once

// Timeline files: the JSON form of the back end's sequences
// (docs/timeline-format.md describes the format, docs/timeline-format.schema.json
// gives its JSON Schema).
//
// Loading builds the file's sequences (BE/Sequence.h), nested sequences
// first, media shared between the items that name the same material. A
// file that is malformed or describes something impossible is refused with
// one message naming the file, the line (when known), the JSON place and
// the problem:
//
//     show.json:12: /sequences/0/tracks/1/items/3/clip/speeed: unknown key
//     "speeed" (did you mean "speed"?)
//
// A media file that does not exist is not an error: the item keeps its
// place and plays offline media, and the file is listed in mMissingFiles.
//
// Every function may be called from any thread.

#include "BE/Sequence.h"

#include <functional>
#include <string>
#include <string_view>
#include <vector>

namespace BE
{

// What the loader asks of each effect and each transition it reads, when the
// caller gives it a check: an error (empty when it is acceptable) that refuses
// the file, and warnings that it keeps. Both are plain texts; the loader adds
// the file and the effect's or transition's place.
struct EffectCheckResult
{
    std::string mError;
    std::vector<std::string> mWarnings;
};
using EffectCheck = std::function<EffectCheckResult(const EffectSettings&)>;
using TransitionCheck = std::function<EffectCheckResult(const TransitionSettings&)>;

struct TimelineLoadResult
{
    // Empty on success.
    std::string mError;
    // The sequence named by "main", else the first one.
    SequenceRef mMain;
    // Every sequence of the file, in file order.
    std::vector<SequenceRef> mSequences;
    // Media files that do not exist, each once, as resolved, in file order.
    std::vector<std::string> mMissingFiles;
    // The checks' warnings, each as "file: place: warning".
    std::vector<std::string> mWarnings;

    bool Succeeded() const { return mError.empty(); }
};

// Reads and loads inPath; relative media paths are taken from inPath's folder.
// inCheck, when given, is asked about every effect of every item, and
// inTransitionCheck about every transition.
TimelineLoadResult LoadTimelineFile(const std::string& inPath, const EffectCheck& inCheck = {},
                                    const TransitionCheck& inTransitionCheck = {});

// Loads inText; inFileName names the text in messages, inBaseFolder is the
// folder relative media paths are taken from.
TimelineLoadResult ParseTimeline(std::string_view inText, const std::string& inFileName,
                                 const std::string& inBaseFolder, const EffectCheck& inCheck = {},
                                 const TransitionCheck& inTransitionCheck = {});

// The timeline text of inMain and of every sequence it nests (those first),
// two-space indented, keys that hold their default value left out. Loading
// it again gives a sequence for which SameSequence holds. Input contract:
// distinct sequences reachable from inMain have distinct names.
std::string WriteTimeline(const SequenceRef& inMain);

} // namespace BE
