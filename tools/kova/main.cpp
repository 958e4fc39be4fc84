/* kova: hear and see what a stroke sounds like, and shape source sets offline, through the
 * exported C interface of libKovaFastTrack. */
#include <cstdio>
#include <cstring>
#include <exception>
#include <string>

#include "cli.h"
#include "commands.h"

namespace {

const char* const kUsage =
    "Usage: kova <command> [options]\n"
    "\n"
    "Commands:\n"
    "  render    play a gesture through the engine into a WAV file (and a PNG picture)\n"
    "  play      play a gesture live through the low-latency output stream\n"
    "  save      build a source set and save it as a source-set file\n"
    "  inspect   show what a saved source-set file holds (--json for JSON)\n"
    "  gesture   print a built-in gesture as CSV\n"
    "\n"
    "kova <command> --help shows the options of a command.\n"
    "Exit codes: 0 success, 1 the library or a file failed, 2 bad usage.\n";

}  // namespace

int main(int argc, char** argv) {
    using namespace kova_tool;
    init_output();
    if (argc < 2) {
        std::fputs(kUsage, stderr);
        return kExitUsage;
    }
    const std::string command = argv[1];
    if (command == "--help" || command == "-h" || command == "help") {
        std::fputs(kUsage, out());
        return kExitOk;
    }
    int rc = kExitOk;
    try {
        Args args(argc, argv, 2);
        if (command == "render") {
            rc = run_render(args);
        } else if (command == "play") {
            rc = run_play(args);
        } else if (command == "save") {
            rc = run_save(args);
        } else if (command == "inspect") {
            rc = run_inspect(args);
        } else if (command == "gesture") {
            rc = run_gesture(args);
        } else {
            std::fflush(out());
            std::fprintf(stderr, "kova: unknown command '%s' (see kova --help)\n", command.c_str());
            return kExitUsage;
        }
    } catch (const ToolError& e) {
        std::fflush(out());
        std::fprintf(stderr, "kova %s: %s\n", command.c_str(), e.what());
        rc = e.code();
    } catch (const std::exception& e) {
        std::fflush(out());
        std::fprintf(stderr, "kova %s: %s\n", command.c_str(), e.what());
        rc = kExitFailure;
    }
    std::fflush(out());
    return rc;
}
