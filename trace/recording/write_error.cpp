// Error records: an error of the common-utilities library, with where it was noticed.
#include <cstring>

#include "trace/recording/record_frame.h"

namespace
{
using namespace qn::tr;

// Which error is recorded, and who has to release it.
class error_to_record
{
public:
    explicit error_to_record(cu_error_t **given) : given_(given) {}
    error_to_record(const error_to_record &) = delete;
    error_to_record &operator=(const error_to_record &) = delete;
    // A fetched error goes to the caller, if there is a place for it.
    ~error_to_record()
    {
        if (fetched_ == nullptr) return;
        if (given_ != nullptr)
            *given_ = fetched_;
        else
            cu_rel_error_1(fetched_);
    }

    // The error; null when there is none.
    const cu_error_t *get()
    {
        const cu_error_t *error = nullptr;
        if (given_ != nullptr && *given_ != nullptr)
            error = *given_;
        else if (cu_get_error_1(&fetched_) == 0)
            error = fetched_;
        return error != nullptr && error->cu_error_id != 0 ? error : nullptr;
    }

private:
    cu_error_t **given_;
    cu_error_t *fetched_ = nullptr;
};

size_t size_of(const char *string) { return string != nullptr ? std::strlen(string) + 1 : 0; }

const char *string_argument(const cu_error_arg_t &argument)
{
    return argument.cu_arg_type == CU_ERROR_ARG_CHAR_STR ? argument.cu_arg_value.cu_char_str : nullptr;
}

// The argument itself, widened; what the union holds beyond it is not the client's.
qn_uint64_t value_bits(const cu_error_arg_t &argument)
{
    qn_uint64_t bits = 0;
    switch (argument.cu_arg_type) {
    case CU_ERROR_ARG_INT: return static_cast<qn_uint64_t>(qn_int64_t{argument.cu_arg_value.cu_int});
    case CU_ERROR_ARG_CHAR_STR: return 0;
    default: std::memcpy(&bits, &argument.cu_arg_value, sizeof bits); return bits;
    }
}

struct error_writer : record_writer {
    static constexpr auto function = format::kind::error;
    using record = trace_record_error_t;

    error_to_record source;
    const cu_error_t *error = nullptr;
    qn_uint32_t trace_id;
    qn_uint32_t line_number;
    const char *function_name;
    const char *file_name;

    error_writer(cu_error_t **given, qn_uint32_t id, const char *func, qn_uint32_t line, const char *file)
        : source(given), trace_id(id), line_number(line), function_name(func), file_name(file)
    {
    }

    qn_int32_t check(const trace_anchor_t *)
    {
        error = source.get();
        return error != nullptr ? 0 : nothing_to_write;
    }

    // Never cut: the allocator refuses what is too long.
    qn_int32_t size(const trace_anchor_t *, unsigned int &length) const
    {
        size_t bytes = sizeof(record) + sizeof(trace_error_arg_t) * size_t{error->cu_arg_cnt};
        bytes += size_of(function_name) + size_of(file_name) + size_of(error->cu_ffdc_id) + size_of(error->cu_msg_cat) +
                 size_of(error->cu_msg_default);
        for (unsigned i = 0; i < error->cu_arg_cnt; ++i) bytes += size_of(string_argument(error->cu_args[i]));
        const size_t rounded = (bytes + 3) & ~size_t{3};
        constexpr size_t too_long = UINT32_MAX & ~3U;
        length = static_cast<unsigned int>(rounded < too_long ? rounded : too_long);
        return 0;
    }

    void fill(trace_record_error_t *to) const
    {
        to->traceId = trace_id;
        to->errorId = static_cast<qn_uint32_t>(error->cu_error_id);
        to->lineNumber = line_number;
        to->msgSetNumber = static_cast<qn_uint32_t>(error->cu_msg_set);
        to->msgNumber = static_cast<qn_uint32_t>(error->cu_msg_num);
        to->argCount = error->cu_arg_cnt;

        auto *arguments = reinterpret_cast<trace_error_arg_t *>(body_of(to));
        string_area strings{to, reinterpret_cast<unsigned char *>(arguments + error->cu_arg_cnt)};
        to->funcNameOffset = strings.add(function_name);
        to->fileNameOffset = strings.add(file_name);
        to->ffdcIdOffset = strings.add(error->cu_ffdc_id);
        to->msgCatNameOffset = strings.add(error->cu_msg_cat);
        to->defMsgOffset = strings.add(error->cu_msg_default);
        for (unsigned i = 0; i < error->cu_arg_cnt; ++i) {
            const cu_error_arg_t &argument = error->cu_args[i];
            arguments[i].type = static_cast<qn_uint32_t>(argument.cu_arg_type);
            const char *string = string_argument(argument);
            arguments[i].value = string != nullptr ? strings.add(string) : value_bits(argument);
        }
    }

private:
    // Behind the arguments: strings one after the other.
    struct string_area {
        trace_record_error_t *start;
        unsigned char *place;

        // The string's offset from the start of the record; 0 when there is none.
        qn_uint32_t add(const char *string)
        {
            if (string == nullptr) return 0;
            const auto offset = static_cast<qn_uint32_t>(place - reinterpret_cast<unsigned char *>(start));
            const size_t size = size_of(string);
            std::memcpy(place, string, size);
            place += size;
            return offset;
        }
    };
};
} // namespace

qn_int32_t tr_ms_record_error_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                const qn_char_t *pFuncName, qn_uint32_t lineNumber, const qn_char_t *pFileName,
                                cu_error_t **pErrorInfo)
{
    error_writer writer(pErrorInfo, traceId, pFuncName, lineNumber, pFileName);
    return write_record(pCompId, fileToken, writer);
}

qn_int32_t tr_record_error_1(const qn_char_t *pCompId, qn_uint32_t traceId, const qn_char_t *pFuncName,
                             qn_uint32_t lineNumber, const qn_char_t *pFileName, cu_error_t **pErrorInfo)
{
    return tr_ms_record_error_1(pCompId, traceId, nullptr, pFuncName, lineNumber, pFileName, pErrorInfo);
}
