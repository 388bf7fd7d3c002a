# SPDX-License-Identifier: Apache-2.0
"""The functions by which clients in C, C++ and Python report without knowing a key."""

import json
import textwrap

from languages import COLUMNS, NOTE, c_comment, comment

C_KINDS = {"boolean": "TARNREPORTING_BOOLEAN", "integer": "TARNREPORTING_INTEGER", "number": "TARNREPORTING_DOUBLE",
           "text": "TARNREPORTING_TEXT_VALUE"}
C_TYPES = {"boolean": "int ", "integer": "int64_t ", "number": "double ", "text": "const char* "}
C_MAKERS = {"boolean": "tarnreporting_boolean", "integer": "tarnreporting_integer", "number": "tarnreporting_double",
            "text": "tarnreporting_report_text"}
CPP_TYPES = {"boolean": "bool ", "integer": "std::int64_t ", "number": "double ", "text": "const char* "}
PYTHON_KINDS = {"boolean": "bool", "integer": "int", "number": "float", "text": "str"}

C_TOP = f"""\
/* Reports: messages that an engine posts without knowing a key, one function each. docs/messages.md lists them.
 *
 *   tarnreporting_reports reports;
 *   tarnreporting_reports_declare(session, &reports);                          once
 *   tarnreporting_report_output_running(writer, &reports, 0.5, "Speaker");     in the audio thread
 *
 * Each posts one message as tarnreporting_post() does, with its promises and its results; those with _at post the time
 * of the event, in nanoseconds since 1970 UTC (0: the time of the call). A text that is null counts as empty. The
 * reports are gone with their session; each takes one of the client's shapes.
 *
 * {NOTE} */
#pragma once

#include <tarnreporting.h>

#ifdef __cplusplus
extern "C" {{
#endif

/* clang-format off */

"""
C_HELPERS = """
/* A text that ends at its zero, as a value; null counts as empty. Longer than a message may hold it is refused when it
 * is posted. */
static inline tarnreporting_value tarnreporting_report_text(const char* text) {
  uint32_t length = 0;
  while (text != NULL && length < UINT32_MAX && text[length] != 0) {
    ++length;
  }
  return tarnreporting_text(text, length);
}

/* Of a rate in Hz, as messages have it: 48000.0. Writes up to 12 bytes to `room`, which must stay until the value is
 * posted. Without the C library's formatting, which may lock and allocate. */
static inline tarnreporting_value tarnreporting_report_hertz(uint32_t rate, char* room) {
  uint32_t digits = 1;
  uint32_t rest;
  uint32_t at;
  for (rest = rate; rest >= 10; rest /= 10) {
    ++digits;
  }
  for (at = digits; at > 0; --at) {
    room[at - 1] = "0123456789"[rate % 10];
    rate /= 10;
  }
  room[digits] = '.';
  room[digits + 1] = '0';
  return tarnreporting_text(room, digits + 2);
}
"""
C_POST = """
/* What all reports do: posts the values in the shape of this report, with the time of the event or, for 0, of the
 * call. For real-time threads. */
static inline int tarnreporting_report_post(tarnreporting_writer* writer, const tarnreporting_reports* reports,
                                            int report, uint64_t stamp_ns, const tarnreporting_value* values,
                                            size_t count) {
  if (reports == NULL) return TARNREPORTING_ARGUMENT;
  if (stamp_ns == 0) return tarnreporting_post(writer, reports->shapes[report], values, count);
  return tarnreporting_post_at(writer, reports->shapes[report], stamp_ns, values, count);
}
"""
C_DECLARE = """
/* Declares the shapes of all reports for the session, once, and fills in `reports`, which the caller owns. Allocates
 * and may wait for a lock: not for real-time threads. TARNREPORTING_ARGUMENT for a null pointer, else what
 * tarnreporting_shape_declare() answers; when it fails in between, those before are declared and `reports` is not to be
 * used. */
static inline int tarnreporting_reports_declare(tarnreporting_session* session, tarnreporting_reports* reports) {
  static const struct {
    uint32_t category;
    uint32_t type;
    size_t key_count;
    tarnreporting_key keys[%(most)d];
  } rows[TARNREPORTING_REPORT_COUNT] = {
%(rows)s
  };
  size_t i;
  if (reports == NULL) return TARNREPORTING_ARGUMENT;
  for (i = 0; i < TARNREPORTING_REPORT_COUNT; ++i) {
    const tarnreporting_shape_options options = {sizeof options, rows[i].category, rows[i].type, rows[i].keys,
                                                 rows[i].key_count};
    const int result = tarnreporting_shape_declare(session, &options, &reports->shapes[i]);
    if (result != TARNREPORTING_OK) return result;
  }
  return TARNREPORTING_OK;
}
"""
C_END = """
/* clang-format on */

#ifdef __cplusplus
}
#endif
"""
CPP_TOP = f"""\
// Reports: messages that an engine posts without knowing a key, one operation each. docs/messages.md lists them.
//
//   const tarnreporting::Reports reports(session);         // once; throws tarnreporting::Error
//   reports.outputRunning(writer, 0.5, "Speaker");         // in the audio thread
//
// Each posts one message as Writer::post() does, with the time of the event in nanoseconds since 1970 UTC, or with 0
// that of the call. The reports may not be used after their session ended.
//
// {NOTE}
#pragma once

#include <tarnreporting.hpp>
#include <tarnreporting_reports.h>

#include <cstdint>

namespace tarnreporting {{

// clang-format off
// The reports of one session. Holds pointers alone: copies report to the same session, and all threads may use one,
// each with its own writer.
class Reports {{
 public:
  // Declares the shapes of all reports, each of which counts among the client's 1024. Throws Error where the library
  // refuses one. Allocates: not for real-time threads; everything else here is for them.
  explicit Reports(const Session& session) {{
    if (const int code = tarnreporting_reports_declare(session.raw(), &reports_); code != TARNREPORTING_OK) {{
      throw Error(code);
    }}
  }}
"""
CPP_END = """
 private:
  tarnreporting_reports reports_ = {};
};
// clang-format on

}  // namespace tarnreporting
"""
PYTHON_TOP = f'''\
"""Reports: messages that an engine posts without knowing a key, one method each. docs/messages.md lists them.

{NOTE}
"""

from typing import Dict, Optional, Tuple

# Category, type, and each key with the kind of its values.
REPORTS: Dict[str, Tuple[int, int, Dict[str, type]]] = {{
'''
PYTHON_CLASS = '''}


class Reports:
    """What a session can report without a key, with the time of the call or `stamp`, in seconds since 1970 UTC. Each
    answers whether the message was posted."""

    def _report(self, name: str, stamp: Optional[float], *values: object) -> bool:
        raise NotImplementedError
'''


def c_reports(table):
    names = ["TARNREPORTING_REPORT_" + word(report).upper() for report in table.reports]
    lines = ["/* Which report is which, by its shape in tarnreporting_reports. */",
             "enum {", *(f"  {name}," for name in names), "  TARNREPORTING_REPORT_COUNT", "};", "",
             *c_comment("The shapes of the reports of one session, which owns them: not to be used once the session "
                        "ended. It never changes once it is declared, so all threads may post with it."),
             "typedef struct tarnreporting_reports tarnreporting_reports;", "struct tarnreporting_reports {",
             "  tarnreporting_shape* shapes[TARNREPORTING_REPORT_COUNT];", "};"]
    most = max((len(report.fields) for report in table.reports), default=1)
    rows = "\n".join(c_row(table, report) for report in table.reports)
    return (C_TOP + "\n".join(lines) + "\n" + C_HELPERS + C_DECLARE % {"most": most, "rows": rows} + C_POST
            + "".join(c_function(table, report) for report in table.reports) + C_END)


def word(report):
    return report.name.replace(" ", "_")


def numbers(table, report):
    """Of its category and its type."""
    return [next(row.number for row in rows if row.name == name)
            for rows, name in ((table.categories, report.category), (table.types, report.type))]


def c_row(table, report):
    keys = [f'{{"{each.key}", {C_KINDS[table.kind_of(each.key)]}}}' for each in report.fields]
    category, kind = numbers(table, report)
    return "\n".join(listed(f"    {{{category}, {kind}, {len(report.fields)}, {{", keys, "}},"))


def listed(head, items, end):
    """The lines of head, items and end, broken between items."""
    lines = [head]
    for at, item in enumerate(items):
        piece = item + (end if at == len(items) - 1 else ",")
        space = " " if at and not lines[-1].isspace() else ""
        if len(lines[-1]) + len(space) + len(piece) > COLUMNS:
            lines.append(" " * len(head))
            space = ""
        lines[-1] += space + piece
    return lines


def c_function(table, report):
    """One with the time of the event, and one with that of the call."""
    arguments = [("uint32_t " if each.hertz else C_TYPES[table.kind_of(each.key)]) + each.argument
                 for each in report.arguments()]
    head = f"static inline int tarnreporting_report_{word(report)}"
    first = ["tarnreporting_writer* writer", "const tarnreporting_reports* reports"]
    lines = ["", *c_comment(f"{posted(report)} The event was at `stamp_ns`."),
             *listed(f"{head}_at(", [*first, "uint64_t stamp_ns", *arguments], ") {")]
    if any(each.hertz for each in report.fields):
        lines.append("  char room[12];")
    lines.append(f"  tarnreporting_value values[{len(report.fields)}];")
    lines += [f"  values[{at}] = {c_value(table, each)};" for at, each in enumerate(report.fields)]
    index = f"TARNREPORTING_REPORT_{word(report).upper()}"
    lines += [f"  return tarnreporting_report_post(writer, reports, {index}, stamp_ns, values, {len(report.fields)});",
              "}", *c_comment(report.text), *listed(f"{head}(", [*first, *arguments], ") {")]
    given = ["writer", "reports", "0", *(each.argument for each in report.arguments())]
    lines += [f"  return tarnreporting_report_{word(report)}_at({', '.join(given)});", "}"]
    return "\n".join(lines) + "\n"


def posted(report):
    """What a report says, by its keys."""
    keys = [f"{each.key} = {f'`{each.argument}`' if each.argument else json.dumps(each.constant)}"
            for each in report.fields]
    return f"Posts {report.category} {report.type}: {', '.join(keys)}."


def c_value(table, each):
    maker = C_MAKERS[table.kind_of(each.key)]
    if each.hertz:
        return f"tarnreporting_report_hertz({each.argument}, room)"
    if each.argument:
        return f"{maker}({each.argument})"
    if isinstance(each.constant, str):
        return f'tarnreporting_text("{each.constant}", {len(each.constant.encode())})'
    return f"{maker}({int(each.constant) if isinstance(each.constant, bool) else each.constant})"


def cpp_reports(table):
    return CPP_TOP + "".join(cpp_operation(table, report) for report in table.reports) + CPP_END


def cpp_operation(table, report):
    first, *rest = report.name.split()
    name = first + "".join(each.title() for each in rest)
    arguments = [("std::uint32_t " if each.hertz else CPP_TYPES[table.kind_of(each.key)]) + each.argument
                 for each in report.arguments()]
    given = ["writer.raw()", "&reports_", "stamp", *(each.argument for each in report.arguments())]
    return "\n".join(["", *comment("  // ", f"{report.text} {posted(report)}"),
                      *listed(f"  Result {name}(", ["Writer& writer", *arguments, "std::uint64_t stamp = 0"],
                              ") const noexcept {"),
                      f"    return Result(tarnreporting_report_{word(report)}_at({', '.join(given)}));", "  }", ""])


def python_reports(table):
    text = PYTHON_TOP
    for report in table.reports:
        category, kind = numbers(table, report)
        keys = [f'"{each.key}": {PYTHON_KINDS[table.kind_of(each.key)]}' for each in report.fields]
        lead = f'    "{word(report)}": ({category}, {kind}, {{'
        whole = lead + ", ".join(keys) + "}),"
        if len(whole) > COLUMNS:
            whole = lead + "\n" + "".join(f"        {key},\n" for key in keys) + "    }),"
        text += whole + "\n"
    return text + PYTHON_CLASS + "".join(python_method(table, report) for report in table.reports)


def python_method(table, report):
    arguments = [f"{each.argument}: {'int' if each.hertz else PYTHON_KINDS[table.kind_of(each.key)]}"
                 for each in report.arguments()]
    values = "".join(f", {python_value(each)}" for each in report.fields)
    said = "\n        ".join(textwrap.wrap(report.text, COLUMNS - 16))
    head = f"    def {word(report)}("
    arguments = listed(head, ["self", *arguments, "*", "stamp: Optional[float] = None"], ") -> bool:")
    return ("\n" + "\n".join(arguments) + f'\n        """{said}"""\n'
            f'        return self._report("{word(report)}", stamp{values})\n')


def python_value(each):
    if each.hertz:
        return f'f"{{int({each.argument})}}.0"'
    if each.argument:
        return each.argument
    return f'"{each.constant}"' if isinstance(each.constant, str) else repr(each.constant)
