// Texts out of a trace as those of a JSON object, without the loss of a byte.
//
// JSON text is Unicode, the bytes in a trace need not be. An object in which some text is not well-formed UTF-8 has
// "encoding": "latin-1", and then every character of its texts stands for the byte of that value.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include <nlohmann/json.hpp>

#include "tools/qntrace/format/escape.h"

namespace qn::dump
{

// Turns the texts of one object into JSON's, and knows whether all of them were UTF-8.
class text_encoder
{
public:
    explicit text_encoder(bool latin_1) : latin_1_(latin_1) {}

    bool all_fit() const { return all_fit_; }

    nlohmann::ordered_json text(std::string_view bytes)
    {
        if (!latin_1_) {
            if (is_utf_8(bytes)) return std::string(bytes);
            all_fit_ = false;
            return nullptr;
        }
        std::string result;
        for (const char c : bytes) {
            const auto byte = static_cast<unsigned char>(c);
            if (byte < 0x80) {
                result += c;
            } else {
                result += static_cast<char>(0xC0 | byte >> 6);
                result += static_cast<char>(0x80 | (byte & 0x3F));
            }
        }
        return result;
    }

    template <typename Text>
    nlohmann::ordered_json text_or_null(const std::optional<Text> &bytes)
    {
        return bytes ? text(*bytes) : nlohmann::ordered_json(nullptr);
    }

private:
    bool latin_1_;
    bool all_fit_ = true;
};

// Appends a line: the object that `make` makes with its texts in UTF-8 or, when one of them is not, all byte by byte.
template <typename Make>
void append_object(std::string &out, Make make)
{
    text_encoder utf_8(false);
    nlohmann::ordered_json object = make(utf_8);
    if (!utf_8.all_fit()) {
        text_encoder latin_1(true);
        object = make(latin_1);
        object["encoding"] = "latin-1";
    }
    out += object.dump(-1, ' ', true);
    out += '\n';
}

} // namespace qn::dump
