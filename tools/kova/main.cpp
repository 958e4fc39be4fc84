/* kova: hear and see what a stroke sounds like, and shape source sets offline, through the
 * exported C interface of libKovaFastTrack. */
#include <CLI/CLI.hpp>
#include <cstdio>
#include <exception>
#include <sstream>
#include <string>

#include "cli.h"
#include "commands.h"

int main(int argc, char** argv) {
    using namespace kova_tool;
    init_output();
    CLI::App app(
        "kova: hear and see what a stroke sounds like, and shape source sets offline, through "
        "libKovaFastTrack.",
        "kova");
    app.set_version_flag("--version", "kova " KOVA_TOOL_VERSION);
    app.require_subcommand(1);
    app.fallthrough();
    app.footer(
        "kova <command> --help shows the options of a command.\n"
        "Exit codes: 0 success, 1 the library or a file failed, 2 bad usage, 130 "
        "interrupted.");
    bool quiet = false, verbose = false;
    app.add_flag("-q,--quiet", quiet, "print nothing but errors and the data asked for");
    app.add_flag("-v,--verbose", verbose, "also show the library's own diagnostic lines");
    const std::pair<const char*, Run> commands[] = {{"render", add_render(app)},
                                                    {"play", add_play(app)},
                                                    {"save", add_save(app)},
                                                    {"inspect", add_inspect(app)},
                                                    {"gesture", add_gesture(app)}};

    // Messages name the command given, as "kova render: ...".
    std::string prefix = "kova";
    for (const auto& command : commands) {
        if (argc > 1 && command.first == std::string(argv[1])) prefix += " " + std::string(argv[1]);
    }
    if (argc > 1 && argv[1][0] != '-' && prefix == "kova") {
        std::fprintf(stderr, "kova: unknown command '%s' (see kova --help)\n", argv[1]);
        return kExitUsage;
    }
    int rc = kExitOk;
    try {
        app.parse(argc, argv);
        set_quiet(quiet);
        set_library_chatter(verbose);
        for (const auto& [name, run] : commands) {
            if (app.got_subcommand(name)) rc = run();
        }
    } catch (const CLI::Success& e) {
        // Help and version go to the tool's own output (descriptor 1 may be silenced).
        std::ostringstream text;
        rc = app.exit(e, text, text);
        std::fputs(text.str().c_str(), out());
    } catch (const CLI::ParseError& e) {
        std::fprintf(stderr, "%s: %s (see %s --help)\n", prefix.c_str(), e.what(), prefix.c_str());
        rc = kExitUsage;
    } catch (const ToolError& e) {
        std::fflush(out());
        std::fprintf(stderr, "%s: %s\n", prefix.c_str(), e.what());
        rc = e.code();
    } catch (const std::exception& e) {
        std::fflush(out());
        std::fprintf(stderr, "%s: %s\n", prefix.c_str(), e.what());
        rc = kExitFailure;
    }
    std::fflush(out());
    return rc;
}
