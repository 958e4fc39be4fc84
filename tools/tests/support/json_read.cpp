#include "support/json_read.h"

#include <cctype>
#include <cstdlib>

namespace kova_test {
namespace {

const Json kNull{};

class Parser {
   public:
    explicit Parser(const std::string& t) : t_(t) {}

    bool document(Json& out) {
        if (!value(out)) return false;
        space();
        return i_ == t_.size();
    }

   private:
    void space() {
        while (i_ < t_.size() && std::isspace(static_cast<unsigned char>(t_[i_]))) ++i_;
    }
    bool literal(const char* word) {
        const std::string w(word);
        if (t_.compare(i_, w.size(), w) != 0) return false;
        i_ += w.size();
        return true;
    }
    bool string(std::string& s) {
        if (t_[i_] != '"') return false;
        ++i_;
        while (i_ < t_.size() && t_[i_] != '"') {
            if (static_cast<unsigned char>(t_[i_]) < 0x20) return false;
            if (t_[i_] == '\\') {
                if (++i_ >= t_.size()) return false;
                const char e = t_[i_];
                if (e == 'u') {
                    if (i_ + 4 >= t_.size()) return false;
                    s += static_cast<char>(std::strtol(t_.substr(i_ + 1, 4).c_str(), nullptr, 16));
                    i_ += 4;
                } else if (e == 'n') {
                    s += '\n';
                } else if (e == '"' || e == '\\' || e == '/') {
                    s += e;
                } else {
                    return false;
                }
                ++i_;
                continue;
            }
            s += t_[i_++];
        }
        if (i_ >= t_.size()) return false;
        ++i_;
        return true;
    }
    bool value(Json& v) {
        space();
        if (i_ >= t_.size()) return false;
        const char c = t_[i_];
        if (c == '{') {
            v.kind = Json::Object;
            ++i_;
            space();
            if (i_ < t_.size() && t_[i_] == '}') return ++i_, true;
            for (;;) {
                space();
                std::string key;
                if (i_ >= t_.size() || !string(key)) return false;
                space();
                if (i_ >= t_.size() || t_[i_++] != ':') return false;
                if (!value(v.fields[key])) return false;
                space();
                if (i_ >= t_.size()) return false;
                if (t_[i_] == ',') {
                    ++i_;
                    continue;
                }
                return t_[i_++] == '}';
            }
        }
        if (c == '[') {
            v.kind = Json::Array;
            ++i_;
            space();
            if (i_ < t_.size() && t_[i_] == ']') return ++i_, true;
            for (;;) {
                v.items.emplace_back();
                if (!value(v.items.back())) return false;
                space();
                if (i_ >= t_.size()) return false;
                if (t_[i_] == ',') {
                    ++i_;
                    continue;
                }
                return t_[i_++] == ']';
            }
        }
        if (c == '"') {
            v.kind = Json::String;
            return string(v.s);
        }
        if (literal("true")) return v.kind = Json::Bool, v.b = true, true;
        if (literal("false")) return v.kind = Json::Bool, v.b = false, true;
        if (literal("null")) return v.kind = Json::Null, true;
        const char* start = t_.c_str() + i_;
        char* end = nullptr;
        v.n = std::strtod(start, &end);
        if (end == start) return false;
        v.kind = Json::Number;
        i_ += static_cast<size_t>(end - start);
        return true;
    }

    const std::string& t_;
    size_t i_ = 0;
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
    return Parser(text).document(out);
}

}  // namespace kova_test
