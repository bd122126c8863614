// Prints the message texts as gencat(1) reads them. Runs during the build; not part of the library.
#include <cstdio>

#include "trace/trace_etbl.h"
#include "trace/trapi_set.h"

namespace
{
void print_message(int number, const char *text)
{
    std::printf("%d \"", number);
    for (; *text != '\0'; ++text) {
        if (*text == '\n')
            std::printf("\\n");
        else if (*text == '"' || *text == '\\')
            std::printf("\\%c", *text);
        else
            std::putchar(*text);
    }
    std::printf("\"\n");
}
} // namespace

int main()
{
    std::printf("$quote \"\n$set 1\n");
    for (int number = 1; number < trapi_set_messages; ++number) print_message(number, cu_mesgtbl_trapi_set[number]);
    std::printf("$set 2\n");
    for (int i = 0; i < trace_failures; ++i)
        print_message(fc_errtbl_trace[i].fc_desc_msg_num, fc_errtbl_trace[i].fc_desc_default);
    return 0;
}
