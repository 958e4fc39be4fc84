/* A strict little JSON reader for checking the tool's --json output: any syntax error makes
 * parse() return false, so the output is checked as JSON, not searched as text. */
#ifndef KOVA_TOOL_TESTS_JSON_READ_H
#define KOVA_TOOL_TESTS_JSON_READ_H

#include <map>
#include <memory>
#include <string>
#include <vector>

namespace kova_test {

struct Json {
    enum Kind { Null, Bool, Number, String, Array, Object } kind = Null;
    bool b = false;
    double n = 0;
    std::string s;
    std::vector<Json> items;
    std::map<std::string, Json> fields;

    /* Field of an object; a missing one is a Null value. */
    const Json& operator[](const std::string& key) const;
    const Json& operator[](size_t i) const;
    bool has(const std::string& key) const { return fields.count(key) != 0; }
};

bool parse_json(const std::string& text, Json& out);

}  // namespace kova_test

#endif
