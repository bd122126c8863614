#include <qn_tr.h>

int main(int argc, char **argv)
{
    static tr_detail_level_t levels[1];
    static const tr_category_description_t categories[1] = {{0, "Main", 1, 1}};
    if (argc != 2 || tr_set_filename_1(argv[1]) != 0) return 1;
    if (tr_register_component_1("DEMO", levels, categories, 1) != 0) return 1;
    return tr_record_printf_1("DEMO", "%d client", 1);
}
