// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/report/ReportAssets.h"

#include <cstddef>

// The assembler puts the files into the program. CMake makes this source depend on them.
#define TONEWERK_ASSET(NAME, FILE)                                                            \
  asm(".pushsection .rodata\n"                                                                \
      ".global tonewerk_report_" #NAME "\n.hidden tonewerk_report_" #NAME                     \
      "\n"                                                                                    \
      "tonewerk_report_" #NAME ":\n.incbin \"" TONEWERK_REPORT_DIRECTORY "/" FILE             \
      "\"\n"                                                                                  \
      ".global tonewerk_report_" #NAME "_end\n.hidden tonewerk_report_" #NAME                 \
      "_end\n"                                                                                \
      "tonewerk_report_" #NAME "_end:\n.byte 0\n.popsection\n");                              \
  extern "C" {                                                                                \
  extern const char tonewerk_report_##NAME[];                                                 \
  extern const char tonewerk_report_##NAME##_end[];                                           \
  }                                                                                           \
  std::string_view tonewerk::report_assets::NAME() {                                          \
    return {tonewerk_report_##NAME,                                                           \
            static_cast<std::size_t>(tonewerk_report_##NAME##_end - tonewerk_report_##NAME)}; \
  }

TONEWERK_ASSET(html, "page.html")
TONEWERK_ASSET(style, "page.css")
TONEWERK_ASSET(script, "page.js")
TONEWERK_ASSET(charts, "charts.js")
