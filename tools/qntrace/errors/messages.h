// The message of an error record: the text of its catalogue, or else its default text, with its arguments filled in.
//
// The catalogue is looked up like its program does, by NLSPATH and the locale's LC_MESSAGES. Its name comes out of a
// trace file, so it leads only to where these point: a name with a slash, which catopen() would take for the path of a
// file, is not looked up.
#pragma once

#include <map>
#include <optional>
#include <string>

#include <nl_types.h>

#include "tools/qntrace/reader/decode.h"

namespace qn::dump
{

// Catalogues, kept open as long as there are not too many. Call setlocale() first.
class message_catalogues
{
public:
    message_catalogues() = default;
    ~message_catalogues() { close(); }
    message_catalogues(const message_catalogues &) = delete;
    message_catalogues &operator=(const message_catalogues &) = delete;

    // Valid until the next call; null when there is no such message.
    const char *text(const std::string &catalogue, std::uint32_t set, std::uint32_t number);

private:
    nl_catd open(const std::string &catalogue);
    void close();

    std::map<std::string, nl_catd> opened_; // those that there are not as well
};

struct error_message {
    enum class origin { catalogue, default_text, ids };

    std::string text; // never empty, without the newline that most messages end with
    origin from = origin::ids;
};

error_message message_of(const reader::error_body &error, message_catalogues &catalogues);

} // namespace qn::dump
