/* A small streaming JSON writer: objects, arrays, strings and numbers, two-space indentation.
 * Numbers are written in their shortest exact form, so they read back as the same double. */
#ifndef KOVA_TOOL_JSON_H
#define KOVA_TOOL_JSON_H

#include <cstdint>
#include <cstdio>
#include <string>
#include <string_view>
#include <vector>

namespace kova_tool {

class JsonWriter {
   public:
    explicit JsonWriter(std::FILE* f) : f_(f) {}
    ~JsonWriter();

    JsonWriter& key(std::string_view k);
    JsonWriter& begin_object();
    JsonWriter& end_object();
    JsonWriter& begin_array();
    JsonWriter& end_array();
    JsonWriter& value(std::string_view s);
    JsonWriter& value(const char* s) { return value(std::string_view(s)); }
    JsonWriter& value(double d); /* NaN and infinities as null */
    JsonWriter& value(int64_t i);
    JsonWriter& value(int32_t i) { return value(static_cast<int64_t>(i)); }
    JsonWriter& value(uint32_t i) { return value(static_cast<int64_t>(i)); }
    JsonWriter& value(bool b);

   private:
    void before_value();
    void newline();
    void write_string(std::string_view s);
    void close_container(char closer);

    std::FILE* f_;
    std::vector<bool> first_; /* per open container: nothing written yet */
    bool after_key_ = false;
};

}  // namespace kova_tool

#endif
