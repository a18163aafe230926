// The built-in demo timeline.

#include "DemoTimeline.h"

namespace vrender
{

std::string_view GetDemoTimelineText()
{
    return R"({
  "version": 1,
  "main": "Demo",
  "sequences": [
    {
      "name": "Card", "rate": 25, "size": [1280, 720],
      "tracks": [
        {"items": [{"start": 0, "end": 3,
                    "media": {"pattern": "pattern:gradient?size=1280x720&from=203050&to=A0C0E0"}}]},
        {"items": [{"start": 0, "end": 3,
                    "media": {"pattern": "pattern:moving?size=1280x720"},
                    "motion": {"scale": 45, "position": [0, 60], "rotation": -4}}]}
      ]
    },
    {
      "name": "Demo", "rate": 25, "size": [1280, 720],
      "tracks": [
        {"items": [
          {"start": 0, "end": 2, "media": {"sequence": "Card"}},
          {"start": 2, "end": 4, "media": {"pattern": "pattern:moving?size=1280x720"},
           "clip": {"in": 1},
           "transitions": [{"match": "TX.Wipe", "start": 1.6, "end": 2.4,
                            "params": {"direction": "right", "border": "6", "softness": "4"}}]}
        ]},
        {"items": [
          {"start": 1, "end": 3, "media": {"pattern": "pattern:bars?size=1280x720"},
           "blend": "multiply", "motion": {"scale": 60},
           "effects": [{"match": "VR.GaussianBlur",
                        "params": {"blurriness": [{"time": 0, "value": 0}, {"time": 2, "value": 12}]}}]}
        ]},
        {"items": [
          {"start": 0, "end": 4, "media": {"pattern": "pattern:moving?size=1280x720"},
           "opacity": [{"time": 0, "value": 0}, {"time": 0.5, "value": 100},
                       {"time": 3.5, "value": 100}, {"time": 4, "value": 0}],
           "motion": {"scale": 30,
                      "position": [{"time": 0, "value": [-420, -220]},
                                   {"time": 4, "value": [420, -220]}],
                      "rotation": [{"time": 0, "value": 0}, {"time": 4, "value": 10}]}}
        ]},
        {"items": [
          {"start": 3, "end": 4,
           "media": {"file": "demo-media/interview.y4m",
                     "stream": {"rate": 25, "size": [1280, 720]}},
           "motion": {"scale": 30, "position": [420, 220]}}
        ]}
      ]
    }
  ]
})";
}

} // namespace vrender
