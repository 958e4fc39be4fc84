#include "support/json_read.h"

#include <cctype>
#include <cstdlib>
#include <cstring>

namespace kova_test {
namespace {

const Json kNull{};

/* Recursive descent over the text; every step returns false at a syntax error. */
struct Parser {
    const std::string& t;
    size_t i = 0;

    void space() {
        while (i < t.size() && std::isspace(static_cast<unsigned char>(t[i]))) ++i;
    }
    bool eat(char c) {
        space();
        if (i >= t.size() || t[i] != c) return false;
        ++i;
        return true;
    }
    bool word(const char* w) {
        const size_t n = std::strlen(w);
        if (t.compare(i, n, w) != 0) return false;
        i += n;
        return true;
    }
    bool string(std::string& s) {
        if (!eat('"')) return false;
        while (i < t.size() && t[i] != '"') {
            char c = t[i++];
            if (static_cast<unsigned char>(c) < 0x20) return false;
            if (c == '\\') {
                if (i >= t.size()) return false;
                c = t[i++];
                if (c == 'u') {
                    if (i + 4 > t.size()) return false;
                    c = static_cast<char>(std::strtol(t.substr(i, 4).c_str(), nullptr, 16));
                    i += 4;
                } else if (c == 'n') {
                    c = '\n';
                } else if (c != '"' && c != '\\' && c != '/') {
                    return false;
                }
            }
            s += c;
        }
        return eat('"');
    }
    /* The items of an array or object up to `close`, separated by commas. */
    template <typename Item>
    bool items(char close, Item item) {
        if (eat(close)) return true;
        do {
            if (!item()) return false;
        } while (eat(','));
        return eat(close);
    }
    bool value(Json& v) {
        space();
        if (eat('{')) {
            v.kind = Json::Object;
            return items('}', [&] {
                std::string key;
                return string(key) && eat(':') && value(v.fields[key]);
            });
        }
        if (eat('[')) {
            v.kind = Json::Array;
            return items(']', [&] { return value(v.items.emplace_back()); });
        }
        if (i < t.size() && t[i] == '"') {
            v.kind = Json::String;
            return string(v.s);
        }
        const bool is_true = word("true");
        if (is_true || word("false")) {
            v.kind = Json::Bool;
            v.b = is_true;
            return true;
        }
        if (word("null")) return true;
        const char* start = t.c_str() + i;
        char* end = nullptr;
        v.n = std::strtod(start, &end);
        if (end == start) return false;
        v.kind = Json::Number;
        i += static_cast<size_t>(end - start);
        return true;
    }
};

}  // namespace

const Json& Json::operator[](const std::string& key) const {
    auto it = fields.find(key);
    return it == fields.end() ? kNull : it->second;
}

const Json& Json::operator[](size_t i) const {
    return i < items.size() ? items[i] : kNull;
}

bool parse_json(const std::string& text, Json& out) {
    out = Json{};
    Parser p{text};
    if (!p.value(out)) return false;
    p.space();
    return p.i == text.size();
}

}  // namespace kova_test
