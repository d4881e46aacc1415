#include "options/OptionText.h"

namespace receiver {

const char* const kHelpIntroduction =
    "Records a live broadcast stream to MP4 files, frame-accurately.\n"
    "Takes H.264 video, audio and timed metadata from the network, a file or a built-in\n"
    "test picture and feeds them to the recording module. Files appear in\n"
    "OUTPUT/YYYYMMDD/PREFIX and are named after the timecode of their first frame.";

const char* const kHelpFooter =
    "Keys on a terminal and signals\n"
    "  r, SIGUSR1          begin a recording        s, SIGUSR2   end it\n"
    "  n, SIGRTMIN         split it: go on in a new file from the next IDR frame on\n"
    "  y                   recover what a crash has left open, when --recover ask has asked\n"
    "  q, Ctrl-C, SIGTERM  end in order, with every file closed; a second signal ends at once\n"
    "  SIGHUP              the terminal is gone: recording goes on\n"
    "\n"
    "Examples\n"
    "  receiver --input test: --output /tmp/rec --seconds 10\n"
    "  receiver --input 'srt://0.0.0.0:9000?mode=listener' --output /srv/recordings --max-minutes 60\n"
    "  receiver --input camera.sdp --output /srv/recordings --prefix CAM1\n"
    "  receiver --input match.ts --speed 8 --record 2-9,12-20 --file-type fragment --output /tmp/rec\n"
    "\n"
    "Exit codes\n"
    "  0  everything that came was recorded as commanded\n"
    "  1  another failure; the sentence tells\n"
    "  2  an option is wrong\n"
    "  3  the source cannot be opened: no such address or file, no answer, refused credentials\n"
    "  4  the source cannot be recorded as it is: no video, another codec or frame rate\n"
    "  5  the module cannot be loaded or refuses to start\n"
    "  6  nothing can be written to the output folder\n"
    "  7  the module failed while it recorded\n"
    "  8  the run ended as commanded, but something is missing from the files, or the module took\n"
    "     a stop command too late\n";

}  // namespace receiver
