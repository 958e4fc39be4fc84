/* What every subcommand of the kova tool shares: the error that ends a command with an exit code,
 * the tool's own output stream, and a cursor over the command line. */
#ifndef KOVA_TOOL_CLI_H
#define KOVA_TOOL_CLI_H

#include <cstdio>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace kova_tool {

/* Exit codes of the tool. */
constexpr int kExitOk = 0;
constexpr int kExitFailure = 1; /* the library or a file failed */
constexpr int kExitUsage = 2;   /* bad command line */

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

/* The tool's own standard output. The library writes its few diagnostic lines to standard output
 * too; those are discarded unless --verbose is given, so they never mix into --json output. */
std::FILE* out();
void set_library_chatter(bool verbose);
void init_output();

/* Walks the arguments of one subcommand; accepts "--name value" and "--name=value". */
class Args {
   public:
    Args(int argc, char** argv, int first);
    bool done() const { return pos_ >= args_.size(); }
    /* The next argument; for "--name=value" only the name part. */
    std::string_view next();
    /* The value of the option just taken by next(). */
    std::string value(std::string_view option);

   private:
    std::vector<std::string> args_;
    size_t pos_ = 0;
    std::string current_;
    const std::string* inline_value_ = nullptr;
    std::string inline_storage_;
};

/* "'text'" for messages. */
std::string quoted(std::string_view text);
/* A number without trailing zeros, as a person writes it: 0.5, 48000, 1e-05. */
std::string num(double value);

}  // namespace kova_tool

#endif
