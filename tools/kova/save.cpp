#include <kova/kova_engine.h>
#include <sys/stat.h>

#include "commands.h"
#include "output_file.h"
#include "sources.h"

namespace kova_tool {
namespace {

const char* const kHelp =
    "Usage: kova save -o FILE [options]\n"
    "Builds a source set and saves it as a source-set file, which --set FILE (and the library's\n"
    "kova_reg_src_bysavefile) can register again. The file keeps the sounds, filters, tune set\n"
    "and repeat points, and the rate and channel count it was made for; thickness and volume\n"
    "belong to the player and are not stored. An existing FILE is replaced whole.\n"
    "A set whose loop is filtered noise gets file_gain = wn_gain unless --file-gain is given,\n"
    "because a set read back from a file plays its loop at file_gain: so it sounds the same.\n"
    "\n"
    "Output:\n"
    "  -o, --output FILE    the source-set file to write\n"
    "  -v, --verbose        also show the library's own diagnostic lines\n";

}  // namespace

int run_save(Args& args) {
    SetupOptions setup;
    std::string output;
    while (!args.done()) {
        const std::string name(args.next());
        if (name == "--help" || name == "-h") {
            std::fprintf(out(), "%s\n%s", kHelp, kSetupHelp);
            return kExitOk;
        }
        if (name == "--thickness" || name == "--volume") {
            usage_error(name + " is not stored in a source-set file (give it to render or play)");
        }
        if (parse_setup_option(name, args, setup)) continue;
        if (name == "-o" || name == "--output") {
            output = args.value(name);
        } else {
            usage_error("unknown option " + quoted(name) + " (see kova save --help)");
        }
    }
    if (output.empty()) usage_error("no output file: give -o FILE");
    finish_setup(setup);
    set_library_chatter(setup.verbose);

    OutputFile file(output);
    Engine engine(setup.format);
    const PreparedSet set = prepare_set(engine, setup);
    if (set.noise_loop && !setup.tune.file_gain) {
        KOVA_TUNE_SET tune{};
        kova_get_tuneset(engine.ctx(), set.id, &tune);
        tune.file_gain = tune.wn_gain;
        if (kova_set_tuneset(engine.ctx(), set.id, &tune) != KOVA_OK)
            failure("setting the tune set failed");
    }

    // The library writes over the file without truncating it; the temporary file is new and
    // empty, so the result holds exactly the set.
    const int32_t written = kova_save_source(engine.ctx(), set.id, file.temp_path().c_str());
    if (written < 0) failure("cannot save to " + quoted(output) + ": " + library_error(written));
    struct stat st {};
    if (fstat(file.fd(), &st) != 0 || st.st_size != written) {
        failure("cannot save to " + quoted(output) + ": the library wrote " +
                std::to_string(written) + " bytes but the file holds " +
                std::to_string(st.st_size));
    }
    file.commit();
    std::fprintf(out(), "saved %s: %d bytes (%u Hz, %u channel%s)\n", output.c_str(), written,
                 engine.format().sample_rate, engine.format().channels,
                 engine.format().channels == 1 ? "" : "s");
    return kExitOk;
}

}  // namespace kova_tool
