#include "json.h"

#include <charconv>
#include <cmath>

namespace kova_tool {

JsonWriter::~JsonWriter() {
    std::fputc('\n', f_);
}

void JsonWriter::newline() {
    std::fputc('\n', f_);
    for (size_t i = 0; i < first_.size(); ++i) std::fputs("  ", f_);
}

void JsonWriter::before_value() {
    if (after_key_) {
        after_key_ = false;
        return;
    }
    if (!first_.empty()) {
        if (!first_.back()) std::fputc(',', f_);
        first_.back() = false;
        newline();
    }
}

JsonWriter& JsonWriter::key(std::string_view k) {
    before_value();
    write_string(k);
    std::fputs(": ", f_);
    after_key_ = true;
    return *this;
}

JsonWriter& JsonWriter::begin_object() {
    before_value();
    std::fputc('{', f_);
    first_.push_back(true);
    return *this;
}

JsonWriter& JsonWriter::end_object() {
    close_container('}');
    return *this;
}

void JsonWriter::close_container(char closer) {
    const bool empty = first_.back();
    first_.pop_back();
    if (!empty) newline();
    std::fputc(closer, f_);
}

JsonWriter& JsonWriter::begin_array() {
    before_value();
    std::fputc('[', f_);
    first_.push_back(true);
    return *this;
}

JsonWriter& JsonWriter::end_array() {
    close_container(']');
    return *this;
}

JsonWriter& JsonWriter::value(std::string_view s) {
    before_value();
    write_string(s);
    return *this;
}

void JsonWriter::write_string(std::string_view s) {
    std::fputc('"', f_);
    for (const char ch : s) {
        const auto c = static_cast<unsigned char>(ch);
        if (c == '"' || c == '\\') {
            std::fputc('\\', f_);
            std::fputc(c, f_);
        } else if (c < 0x20) {
            std::fprintf(f_, "\\u%04x", c);
        } else {
            std::fputc(c, f_);
        }
    }
    std::fputc('"', f_);
}

JsonWriter& JsonWriter::value(double d) {
    before_value();
    if (!std::isfinite(d)) {
        std::fputs("null", f_);
        return *this;
    }
    char buf[64];
    const auto res = std::to_chars(buf, buf + sizeof buf, d);
    std::fwrite(buf, 1, static_cast<size_t>(res.ptr - buf), f_);
    return *this;
}

JsonWriter& JsonWriter::value(int64_t i) {
    before_value();
    std::fprintf(f_, "%lld", static_cast<long long>(i));
    return *this;
}

JsonWriter& JsonWriter::value(bool b) {
    before_value();
    std::fputs(b ? "true" : "false", f_);
    return *this;
}

}  // namespace kova_tool
