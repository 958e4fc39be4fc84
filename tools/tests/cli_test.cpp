/* Command line of the kova tool: help, exit codes, and that bad values are named with their
 * accepted range and leave existing files alone. */
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include "support/tool_run.h"

namespace kova_test {
namespace {

TEST(KovaCli, HelpListsCommandsAndOptions) {
    TempDir dir;
    RunResult r = run_kova({"--help"}, dir.path());
    EXPECT_EQ(r.code, 0);
    for (const char* cmd : {"render", "play", "save", "inspect", "gesture"}) {
        EXPECT_NE(r.out.find(cmd), std::string::npos) << cmd;
    }
    r = run_kova({"render", "--help"}, dir.path());
    EXPECT_EQ(r.code, 0);
    EXPECT_NE(r.out.find("--gesture"), std::string::npos);
    EXPECT_NE(r.out.find("--png"), std::string::npos);
    // The tune values each kind of set starts with, as the library and the built-in set give them.
    EXPECT_NE(r.out.find("built-in   1     0.2   1         0.2       1       1"), std::string::npos)
        << r.out;
    EXPECT_NE(r.out.find("--loop     1     0.4   1         0.2       0       0.4       0.6"),
              std::string::npos);
    r = run_kova({"play", "--help"}, dir.path());
    EXPECT_EQ(r.code, 0);
    EXPECT_NE(r.out.find("--capture"), std::string::npos);
    r = run_kova({"--version"}, dir.path());
    EXPECT_EQ(r.code, 0);
    EXPECT_EQ(r.out.rfind("kova 1.", 0), 0u) << r.out;
}

TEST(KovaCli, MissingOrUnknownCommandIsUsageError) {
    TempDir dir;
    RunResult r = run_kova({}, dir.path());
    EXPECT_EQ(r.code, 2);
    r = run_kova({"paint"}, dir.path());
    EXPECT_EQ(r.code, 2);
    EXPECT_EQ(count_lines(r.err), 1) << r.err;
    EXPECT_NE(r.err.find("paint"), std::string::npos);
    r = run_kova({"render", "--colour", "red"}, dir.path());
    EXPECT_EQ(r.code, 2);
    EXPECT_NE(r.err.find("--colour"), std::string::npos);
}

struct BadValue {
    std::vector<std::string> args;
    const char* value;
    const char* range;
};

TEST(KovaCli, BadValuesNameTheValueAndTheRange) {
    const BadValue cases[] = {
        {{"render", "--rate", "7000"}, "7000", "8000..48000"},
        {{"render", "--rate", "48001"}, "48001", "8000..48000"},
        {{"render", "--channels", "3"}, "3", "1..2"},
        {{"render", "--gain", "1.5"}, "1.5", "0..1"},
        {{"render", "--pan", "-0.1"}, "-0.1", "0..1"},
        {{"render", "--osc-depth", "2"}, "2", "0..1"},
        {{"render", "--end-gain", "abc"}, "abc", "0..1"},
        {{"render", "--thickness", "1.01"}, "1.01", "0..1"},
        {{"play", "--volume", "3"}, "3", "0..1"},
        {{"render", "--touch-rate", "500"}, "500", "10..300"},
        {{"render", "--screen", "0x2280"}, "0", "1..100000"},
        {{"render", "--filter", "bandpass:30000:100"}, "30000", "1..23999"},
        {{"render", "--rate", "16000", "--filter", "lowpass:9000"}, "9000", "1..7999"},
        {{"render", "--png-size", "100x500"}, "100", "400..8000"},
        {{"save", "-o", "x.kset", "--repeat", "loop=0:5000"}, "5000", "0..1000"},
        {{"save", "-o", "x.kset", "--repeat", "loop=600:100"}, "600", "after end 100"},
        {{"save", "-o", "x.kset", "--repeat", "loop=900:", "--repeat", "loop=:800"},
         "900",
         "after end 800"},
        {{"render", "--panning", "yes"}, "yes", "on or off"},
        {{"play", "--osc", "1"}, "'1'", "on or off"},
    };
    TempDir dir;
    for (const BadValue& c : cases) {
        const RunResult r = run_kova(c.args, dir.path());
        SCOPED_TRACE(c.args[1] + " " + c.args.back());
        EXPECT_EQ(r.code, 2);
        EXPECT_EQ(count_lines(r.err), 1) << r.err;
        EXPECT_NE(r.err.find(c.value), std::string::npos) << r.err;
        EXPECT_NE(r.err.find(c.range), std::string::npos) << r.err;
    }
    EXPECT_EQ(dir.list().size(), 0u) << "a refused command wrote a file";
}

TEST(KovaCli, InconsistentOptionsAreUsageErrors) {
    TempDir dir;
    RunResult r = run_kova({"render", "--channels", "1", "--panning", "on"}, dir.path());
    EXPECT_EQ(r.code, 2);
    EXPECT_NE(r.err.find("--channels 2"), std::string::npos) << r.err;
    r = run_kova({"render", "--filter", "lowpass:1000", "--filter", "lowpass:2000"}, dir.path());
    EXPECT_EQ(r.code, 2);
    r = run_kova({"render", "--start", "tick.raw"}, dir.path());
    EXPECT_EQ(r.code, 2) << "a start sound without a loop";
    r = run_kova({"save", "--thickness", "0.5", "-o", "x"}, dir.path());
    EXPECT_EQ(r.code, 2);
    r = run_kova({"save"}, dir.path());
    EXPECT_EQ(r.code, 2);
}

TEST(KovaCli, BadInputFilesFailWithExitOneAndKeepTheOutput) {
    TempDir dir;
    const std::string keep = "previous contents";
    write_file(dir.file("out.wav"), keep);
    write_file(dir.file("bad.csv"), "time_ms,action,x,y\n0,down,10,10\n8,wiggle,20,20\n");
    write_file(dir.file("late.csv"), "time_ms,action,x,y\n100,down,10,10\n50,move,20,20\n");
    write_file(dir.file("empty.raw"), "");
    write_file(dir.file("one.raw"), "x");
    write_file(dir.file("noise.bin"), "not a sound");
    ASSERT_EQ(mkfifo(dir.file("fifo").c_str(), 0600), 0);
    write_file(dir.file("big.csv"), "");
    ASSERT_EQ(truncate(dir.file("big.csv").c_str(), (64 << 20) + 1),
              0);  // sparse, one byte too many

    struct Case {
        std::vector<std::string> args;
        const char* mention;
    } cases[] = {
        {{"render", "--gesture", "nothere.csv", "-o", "out.wav"}, "nothere.csv"},
        {{"render", "--gesture", "bad.csv", "-o", "out.wav"}, "bad.csv:3:"},
        {{"render", "--gesture", "late.csv", "-o", "out.wav"}, "late.csv:3:"},
        {{"render", "--loop", "noloop.raw", "-o", "out.wav"}, "noloop.raw"},
        {{"render", "--loop", "empty.raw", "-o", "out.wav"}, "needs at least"},
        {{"render", "--loop", "one.raw", "-o", "out.wav"},
         "a loop sound needs at least 240 (5 ms)"},
        {{"render", "--loop", "noise.bin", "-o", "out.wav"}, "--raw"},
        {{"render", "--loop", "fifo", "-o", "out.wav"}, "FIFO, not a regular file"},
        {{"render", "--set", ".", "-o", "out.wav"}, "it is a folder"},
        {{"render", "--gesture", "/dev/zero", "-o", "out.wav"}, "device, not a regular file"},
        {{"render", "--gesture", "fifo", "-o", "out.wav"}, "FIFO, not a regular file"},
        {{"inspect", "fifo"}, "FIFO, not a regular file"},
        {{"render", "--gesture", "big.csv", "-o", "out.wav"}, "more than the 67108864 accepted"},
        {{"render", "-o", "fifo"}, "FIFO, not a regular file"},
        {{"render", "--set", "noset.kset", "-o", "out.wav"}, "noset.kset"},
        {{"render", "--set", "bad.csv", "-o", "out.wav"}, "not a source-set file"},
        {{"render", "-o", "no/such/dir/out.wav"}, "no/such/dir/out.wav"},
        {{"inspect", "noset.kset"}, "noset.kset"},
    };
    for (const Case& c : cases) {
        const RunResult r = run_kova(c.args, dir.path());
        SCOPED_TRACE(c.args[0] + " " + c.args[1] + " " + c.args[2 % c.args.size()]);
        EXPECT_EQ(r.code, 1);
        EXPECT_EQ(count_lines(r.err), 1) << r.err;
        EXPECT_NE(r.err.find(c.mention), std::string::npos) << r.err;
        EXPECT_EQ(read_file(dir.file("out.wav")), keep);
    }
    EXPECT_EQ(dir.list().size(), 8u) << "a failed command left a file behind";
}

/* A link is written through to its target; "-" is standard output, with the report on stderr. */
TEST(KovaCli, OutputsThroughLinksAndToStandardOutput) {
    TempDir dir;
    write_file(dir.file("target.wav"), "old");
    ASSERT_EQ(symlink("target.wav", dir.file("link.wav").c_str()), 0);
    RunResult r = run_kova({"render", "--gesture", "fast", "-o", "link.wav"}, dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    struct stat st {};
    ASSERT_EQ(lstat(dir.file("link.wav").c_str(), &st), 0);
    EXPECT_TRUE(S_ISLNK(st.st_mode)) << "the link was replaced";
    const std::string wav = read_file(dir.file("target.wav"));
    r = run_kova({"render", "--gesture", "fast", "-o", "-"}, dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    EXPECT_EQ(r.out, wav) << "standard output holds the same WAV";
    EXPECT_NE(r.err.find("wrote -"), std::string::npos) << r.err;
    r = run_kova({"-q", "render", "--gesture", "fast", "-o", "q.wav"}, dir.path());
    EXPECT_EQ(r.code, 0);
    EXPECT_EQ(r.out + r.err, "") << "-q prints nothing";
    EXPECT_EQ(read_file(dir.file("q.wav")), wav);
}

TEST(KovaCli, GestureCommandPrintsCsvThatRenderReads) {
    TempDir dir;
    RunResult r = run_kova({"gesture", "fast", "--touch-rate", "60", "-o", "fast.csv"}, dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    const std::string csv = read_file(dir.file("fast.csv"));
    EXPECT_EQ(csv.rfind("time_ms,action,x,y,aux\n", 0), 0u);
    EXPECT_NE(csv.find(",down,"), std::string::npos);
    EXPECT_NE(csv.find(",up,"), std::string::npos);
    // 300 ms at 60 Hz: moves every 16 or 17 ms.
    EXPECT_NE(csv.find("\n17,move,"), std::string::npos) << csv.substr(0, 200);
    // As a spreadsheet saves it: with a UTF-8 byte-order mark.
    write_file(dir.file("fast.csv"), "\xEF\xBB\xBF" + csv);
    r = run_kova({"render", "--gesture", "fast.csv", "-o", "fast.wav"}, dir.path());
    EXPECT_EQ(r.code, 0) << r.err;
    r = run_kova({"gesture", "zigzag"}, dir.path());
    EXPECT_EQ(r.code, 2);
}

}  // namespace
}  // namespace kova_test
