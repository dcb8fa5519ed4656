#include "fuzz/seed_recorder.h"

using hardware::dalix::fuzz::SeedRecorder;

// Configuration files in the shapes the service meets: properties,
// calibration values, comments, blanks, and a NUL inside a line.
bool WriteSeeds(SeedRecorder& recorder) {
  return recorder.Write("properties", "# antenna\nAntennaPairs = 1\n  spacing=20 ; mm\n\n") &&
         recorder.Write("calibration",
                        "cal.ch5.tx_power = 0x1F1F1F1F\ncal.ch9.pg_delay=0x34\n;x=1\nbroken\n") &&
         recorder.Write("nul", std::string("key\0x = 1\nvalue = 2\0y\n", 23));
}
