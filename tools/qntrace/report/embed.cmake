# Turns the page, its style and its script into a C++ source. Run as a script, with
#   FOLDER   where report.html and report.css are
#   MODULES  the script's modules, in their order
#   UPLOT    the chart library's package
#   OUTPUT   the source to write
#
# The modules become one script, each a function that returns what it exports. A module exports functions, constants and
# classes at the beginning of a line, and imports names from those before it.

set(limit "qn~page") # ends no text of ours

function(raw_literal text result)
    string(FIND "${text}" ")${limit}\"" inside)
    if(NOT inside EQUAL -1)
        message(FATAL_ERROR "a part of the page holds the end of a literal")
    endif()
    set(${result} "R\"${limit}(${text})${limit}\"" PARENT_SCOPE)
endfunction()

file(READ ${UPLOT}/LICENSE license)
file(READ ${UPLOT}/dist/uPlot.iife.min.js chart_script)
file(READ ${UPLOT}/dist/uPlot.min.css chart_style)
file(READ ${FOLDER}/report.html page)
file(READ ${FOLDER}/report.css own_style)

set(script "/*!\n${license}*/\n${chart_script}\n(() => {\n\"use strict\";\nconst modules = {};\n")
foreach(module IN LISTS MODULES)
    cmake_path(GET module FILENAME name)
    file(READ ${module} text)
    string(REGEX REPLACE "(^|\n)import ({[^}]*}) from \"\\./([^\"]*)\";" "\\1const \\2 = modules[\"\\3\"];" text "${text}")
    string(REGEX MATCHALL "\nexport (function|const|class) [A-Za-z]+" exports "${text}")
    list(TRANSFORM exports REPLACE ".* " "")
    list(JOIN exports ", " exports)
    string(REGEX REPLACE "\nexport " "\n" text "${text}")
    string(APPEND script "modules[\"${name}\"] = (() => {\n${text}return { ${exports} };\n})();\n")
endforeach()
string(APPEND script "})();\n")
set(style "${chart_style}\n${own_style}")

foreach(part script style)
    if("${${part}}" MATCHES "</(script|style)|<!--|\r")
        message(FATAL_ERROR "the ${part} of the page holds what a browser would not take as it is")
    endif()
    string(SHA256 ${part}_sha256 "${${part}}")
    raw_literal("${${part}}" ${part})
endforeach()
raw_literal("${page}" page)

file(WRITE ${OUTPUT} "// Made by embed.cmake; changes are lost.
#include \"tools/qntrace/report/assets.h\"

namespace
{
constexpr qn::dump::page_assets assets = {
${page},
${style},
\"${style_sha256}\",
${script},
\"${script_sha256}\",
};
} // namespace

const qn::dump::page_assets *qn::dump::report_assets() { return &assets; }
")
