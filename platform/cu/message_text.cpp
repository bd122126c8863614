// The message of an error, from its catalogue or its default text. No state, no lock: catopen() and the like
// are safe in threads, and each call opens the catalogue for itself.
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <new>
#include <nl_types.h>
#include <optional>
#include <string>

#include <qn_cu.h>

#include "platform/common/files.h"
#include "platform/cu/render.h"

namespace qn::cu
{
namespace
{
class catalogue
{
public:
    explicit catalogue(const char *name) : opened_(platform::open_messages(name)) {}
    catalogue(const catalogue &) = delete;
    catalogue &operator=(const catalogue &) = delete;
    ~catalogue()
    {
        if (is_open()) catclose(opened_);
    }

    // The catalogue's own memory, for as long as it is open; null when it has no such message.
    const char *message(int set, int number) const
    {
        return is_open() ? catgets(opened_, set, number, nullptr) : nullptr;
    }

private:
    bool is_open() const { return opened_ != reinterpret_cast<nl_catd>(-1); }

    nl_catd opened_;
};

std::span<const cu_error_arg_t> inserts_of(const cu_error_t &error)
{
    if (error.cu_args == nullptr) return {};
    return {error.cu_args, error.cu_arg_cnt};
}

// Nothing when there is no such text, or one whose conversions do not fit the inserts.
std::optional<std::string> catalogue_message(const cu_error_t &error)
{
    if (error.cu_msg_cat == nullptr || *error.cu_msg_cat == '\0') return std::nullopt;
    const catalogue opened(error.cu_msg_cat);
    const char *text = opened.message(error.cu_msg_set, error.cu_msg_num);
    if (text == nullptr) return std::nullopt;
    const text_conversions conversions = find_conversions(text);
    if (!conversions_fit(conversions, inserts_of(error))) return std::nullopt;
    return fill_in(text, conversions, inserts_of(error));
}

std::string message_of(const cu_error_t &error)
{
    if (auto text = catalogue_message(error)) return *std::move(text);
    if (error.cu_msg_default == nullptr) return {};
    return fill_in(error.cu_msg_default, find_conversions(error.cu_msg_default), inserts_of(error));
}
} // namespace
} // namespace qn::cu

int cu_get_errmsg_1(const cu_error_t *error, char **text)
{
    if (text == nullptr) return EINVAL;
    *text = nullptr;
    if (error == nullptr) return EINVAL;
    const qn::platform::no_cancel whole;
    try {
        *text = strdup(qn::cu::message_of(*error).c_str());
    } catch (const std::exception &) {
    }
    return *text != nullptr ? 0 : ENOMEM;
}
