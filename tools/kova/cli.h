/* What every subcommand of the kova tool shares: the error that ends a command with an exit code
 * and the tool's own output streams. */
#ifndef KOVA_TOOL_CLI_H
#define KOVA_TOOL_CLI_H

#include <cstdio>
#include <stdexcept>
#include <string>
#include <string_view>

namespace kova_tool {

/* Exit codes of the tool. */
constexpr int kExitOk = 0;
constexpr int kExitFailure = 1;       /* the library or a file failed */
constexpr int kExitUsage = 2;         /* bad command line */
constexpr int kExitInterrupted = 130; /* SIGINT or SIGTERM, as a shell reports Ctrl-C */

/* Ends a command: main() prints "kova <command>: <what>" on one line and exits with `code`. */
class ToolError : public std::runtime_error {
   public:
    ToolError(int code, const std::string& what) : std::runtime_error(what), code_(code) {}
    int code() const { return code_; }

   private:
    int code_;
};

[[noreturn]] void usage_error(const std::string& what);
[[noreturn]] void failure(const std::string& what);

/* The tool's own standard output, for what a command produces (CSV, JSON, `-o -` data). The
 * library writes its few diagnostic lines to standard output too; those are discarded unless
 * --verbose is given, so they never mix into the tool's output. */
std::FILE* out();
void set_library_chatter(bool verbose);
void init_output();

/* Reports about the work done ("wrote ..."): standard output, standard error once standard
 * output carries data (`-o -`), nowhere with -q. Notes and warnings go to note(). */
std::FILE* info();
void set_quiet(bool quiet);
bool quiet();
void data_on_stdout();
/* One line "kova: note: <text>" on standard error, unless -q. */
void note(const std::string& text);

/* "'text'" for messages. */
std::string in_quotes(std::string_view text);
/* A number without trailing zeros, as a person writes it: 0.5, 48000, 1e-05. */
std::string num(double value);

}  // namespace kova_tool

#endif
