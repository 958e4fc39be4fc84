#include <kova/kova_engine.h>
#include <sys/stat.h>

#include "commands.h"
#include "output_file.h"
#include "sources.h"

namespace kova_tool {
namespace {

struct SaveOptions {
    SetupOptions setup;
    std::string output;
};

int run_save(SaveOptions& o) {
    SetupOptions& setup = o.setup;
    const std::string& output = o.output;
    finish_setup(setup);
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
    if (written < 0) failure("cannot save to " + in_quotes(output) + ": " + library_error(written));
    struct stat st {};
    if (fstat(file.fd(), &st) != 0 || st.st_size != written) {
        failure("cannot save to " + in_quotes(output) + ": the library wrote " +
                std::to_string(written) + " bytes but the file holds " +
                std::to_string(st.st_size));
    }
    file.commit();
    std::fprintf(info(), "saved %s: %d bytes (%u Hz, %u channel%s)\n", output.c_str(), written,
                 engine.format().sample_rate, engine.format().channels,
                 engine.format().channels == 1 ? "" : "s");
    return kExitOk;
}

}  // namespace

Run add_save(CLI::App& app) {
    auto o = std::make_shared<SaveOptions>();
    CLI::App* sub =
        app.add_subcommand("save", "build a source set and save it as a source-set file");
    sub->add_option("-o,--output", o->output, "the source-set file to write, - for standard output")
        ->required()
        ->type_name("FILE")
        ->group("Output");
    add_setup_options(*sub, o->setup, false);
    return [o] { return run_save(*o); };
}

}  // namespace kova_tool
