// The text of vrender --help.

#include "Options.h"

#include <string>
#include <string_view>
#include <vector>

namespace vrender
{
namespace
{

// The names of a ", "-separated list.
std::vector<std::string_view> SplitNames(std::string_view inList)
{
    std::vector<std::string_view> names;
    while (!inList.empty())
    {
        const std::size_t comma = inList.find(", ");
        names.push_back(inList.substr(0, comma));
        inList = comma == std::string_view::npos ? std::string_view() : inList.substr(comma + 2);
    }
    return names;
}

} // namespace

std::string GetUsageText()
{
    std::string text = R"(vrender: renders video frames through the VideoRenderer module.

Usage:
  vrender                       render the built-in demo timeline (four tracks at
                                1280x720, 100 frames) into out/demo/, replacing an
                                earlier demo
  vrender render TIMELINE [options]
                                render frames of a timeline file (.json)
  vrender source MEDIA [options]
                                render frames of one media source
  vrender info                  print the built-in example cutlist (colours as
                                0xAARRGGBB)
  vrender info TIMELINE         print a timeline file: its sequences, tracks,
                                items and media, then the cutlist it renders
                                through (segments and node trees)
  vrender info --demo           the same for the built-in demo timeline
  vrender demo [options]        the demo, with options as for render
  vrender --help                this text

MEDIA is an image file (.png, .jpg), a Y4M file (.y4m), or a generated pattern:
  pattern:KIND[?KEY=VALUE&...]  KIND bars, solid, gradient (still pictures) or
                                moving (a new picture every frame); keys
                                size=WxH, rate=R, field=progressive|upper|lower,
                                par=N:D, alpha=none|straight|premultiplied,
                                opacity=0..255, matte=RRGGBB, color=RRGGBB (solid),
                                from=RRGGBB and to=RRGGBB (gradient)
  e.g. pattern:moving?size=1920x1080&rate=50

Options:
Options of render, demo and source:
  --frames A:B        frames A to B, both included
  --start N           first frame (default 0)
  --count N           number of frames (default: the whole timeline or file; 1
                      for a still image or a still pattern; 50 for
                      pattern:moving, which has no end)
  --size WxH          output size (default: the sequence's or source's)
  --par N:D           output pixel aspect ratio (default: the source's)
  --format NAME       pixel format to render in (default BGRA_4444_8u), one of
)";
    // The format names, wrapped under the option's description.
    const std::string names = RenderableFormatNames();
    std::string line = "                     ";
    for (const std::string_view name : SplitNames(names))
    {
        if (line.size() + name.size() + 2 > 78)
        {
            text += line + "\n";
            line = "                     ";
        }
        line += " ";
        line += name;
        line += ",";
    }
    line.back() = '\n';
    text += line;
    text += R"(  --field F           progressive, upper or lower (default: the source's)
  --rate R            frame rate of the frame grid and of Y4M output, e.g. 25,
                      30000/1001, 29.97 (default: the source's, a pattern's
                      rate= included; 25 for still images)
  --quality Q         0 (draft) to 5 (best, the default)
  -o PATTERN          numbered PNG files, e.g. out/frame_%05d.png
                      (default out/frames/frame_%05d.png); the number is the
                      source frame's: --frames 10:19 writes frame_00010.png
                      to frame_00019.png
  -o FILE.y4m         a Y4M file
  -o -, --y4m         a Y4M stream on standard output, e.g.
                      vrender source pattern:moving --y4m > out.y4m
  --output-dir DIR    PNG files DIR/frame_00000.png, ...
  -y, --overwrite     replace PNG files of the same pattern from an earlier
                      render and remove its frames outside the new range
                      (without it, such files stop the render; files that do
                      not match the pattern are never touched)
  --chroma C          Y4M chroma: 420 (default) or 444
  -j, --jobs N        frames in flight, 1 to 64 (default: twice the cores)
  --memory SIZE       memory the frames in flight may take, e.g. 512M or 4G
                      (default: half the physical memory); fewer frames are
                      kept in flight when they need more
  -q, --quiet         no progress bar (warnings and errors still show)
  --keep-going        a frame that fails is reported, written black, and the
                      render goes on (the exit status is still 1)
  -h, --help          this text

PNG files are 8-bit for 8-bit formats and 16-bit for deeper ones (16u, 32f),
RGBA when the frame has alpha that is not opaque, else RGB.

Filters of source, stacked on the source in this order (a timeline sets
them per clip instead):
  --remove-pulldown P       remove 2:3 pulldown; P is the cadence phase of
                            frame 0: AA, BB, BC, CD or DD (replaces the
                            field filters below)
  --reverse-field-dominance treat the source's field order as swapped
  --field-reverse           deliver the fields in the requested order
  --deinterlace             keep one field and rebuild the other
  --remove-flicker          vertical flicker filter
  --interlace-consecutive   interlace each two consecutive frames (not for
                            still sources: ignored with a warning)
  --scale WxH               scale to WxH with pixel-aspect correction (--par
                            also brings in the scaler)
  --speed S                 re-time by S (0.5 slow motion, -1 reverse) with
                            frame mixing, or frame blending with --frame-blend
                            (not for still sources: ignored with a warning)

Ctrl-C or SIGTERM cancels the frames in flight and stops within a second,
leaving only complete files.

Exit status:
  0    every frame was written
  1    a failure while rendering: an unreadable timeline file or media (also
       a FIFO or device), a frame that failed, a frame too large for the
       memory budget, an output that cannot be written or that would replace
       an earlier render
  2    bad arguments (the message names the argument and the problem)
  130  cancelled with Ctrl-C (SIGINT)
  143  cancelled with SIGTERM
)";
    return text;
}

} // namespace vrender
