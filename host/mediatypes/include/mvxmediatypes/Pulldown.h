#pragma once

// 2:3 pulldown: how 23.976 fps film frames are spread over the fields of
// 29.97 fps interlaced video, and how to find a film frame again.
//
// Telecine gives the four film frames A B C D of a cycle 2, 3, 2 and 3 fields
// in turn, so ten fields (five video frames) carry four film frames:
//
//   fields (in time order)  A A | B B | B C | C D | D D
//   video frame of cycle     0     1     2     3     4
//   kind                     W     W     S     S     W
//
// W: the video frame holds the two fields of one film frame (whole);
// S: it holds fields of two film frames (split). Film A lies whole in frame 0,
// B whole in frame 1 (its third field is in frame 2), C is split over frames 2
// and 3, D lies whole in frame 4 (its first field is in frame 3).
//
// The cadence says where video frame 0 of the material falls in that cycle;
// the name is the pair of film frames it holds, and the W/S string the kinds
// of video frames 0 to 4:
//
//   kPulldownCadence_23_AA  video frame 0 is AA   W W S S W
//   kPulldownCadence_23_BB  video frame 0 is BB   W S S W W
//   kPulldownCadence_23_BC  video frame 0 is BC   S S W W W
//   kPulldownCadence_23_CD  video frame 0 is CD   S W W W S
//   kPulldownCadence_23_DD  video frame 0 is DD   W W W S S
//
// Film frame numbering: film frame 0 is the first film frame whose first field
// lies at or after the first field of video frame 0 (a film frame cut at the
// start, such as the lone B field of cadence BC, is not counted); the film
// frames then follow in order, n at time n x (video frame duration x 5 / 4),
// with negative numbers before it.

#include "mvxmediatypes/TickTime.h"

#include <cstdint>

namespace mvxmediatypes
{

enum PulldownCadence : std::int32_t
{
    // No pulldown; not a cadence that can be removed.
    kPulldownCadence_None = 0,
    kPulldownCadence_23_AA = 1,
    kPulldownCadence_23_BB = 2,
    kPulldownCadence_23_BC = 3,
    kPulldownCadence_23_CD = 4,
    kPulldownCadence_23_DD = 5,
};

// The time of the video frame (at inVideoRate, the rate of the material that
// carries the pulldown, 29.97 for NTSC) that holds the film frame containing
// inFilmTime (a time on the film grid, inVideoRate x 4 / 5). outSplit is set
// when the film frame's two fields lie in that video frame and the one before
// it (then the answer is the later of the two), cleared when the answer holds
// both fields.
//
// Input contracts: inVideoRate positive, inCadence one of the five 2:3
// cadences, inFilmTime valid. Safe from any thread.
TickTime MapPulldownFrameTo2997Frame(TickTime inFilmTime, const FrameRate& inVideoRate,
                                     PulldownCadence inCadence, bool& outSplit);

} // namespace mvxmediatypes
