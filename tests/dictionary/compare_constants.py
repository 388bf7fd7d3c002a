# SPDX-License-Identifier: Apache-2.0
"""Compiles the constants and reports for C and C++ as strictly as a client may, and compares the constants and those
for Python with the numbers and keys of dictionary/messages.toml, read here without the generator.

usage: compare_constants.py ROOT C++_COMPILER
"""

import enum
import os
import re
import subprocess
import sys
import tempfile
import tomllib

LISTS = (("category", "Category"), ("domain", "Domain"), ("type", "Type"), ("service", "ServiceType"))
# {0} of a struct is how C says it.
FLAGS = ["-Wall", "-Wextra", "-Wpedantic", "-Wconversion", "-Werror", "-Wno-missing-field-initializers"]
DEFINED = re.compile(r"^#define (TARN_\w+) (?:UINT\d+_C\((\w+)\)|\"([^\"]+)\")", re.MULTILINE)
ENUMERATION = re.compile(r"enum class (\w+) : std::uint\d+_t \{(.*?)\};", re.DOTALL)
ENUMERATOR = re.compile(r"^  (\w+) = (\w+),$", re.MULTILINE)
KEY = re.compile(r"inline constexpr std::string_view k(\w+) = \"([^\"]+)\";")
C_PREFIXES = {"category": "TARN_CATEGORY_", "domain": "TARN_DOMAIN_", "type": "TARN_TYPE_", "service": "TARN_SERVICE_"}


def expect(what, found, wanted):
    if found != wanted:
        raise SystemExit(f"{what}: {sorted(found - wanted)} too many, {sorted(wanted - found)} missing")


def read(*path):
    with open(os.path.join(*path), encoding="utf-8") as file:
        return file.read()


def spelt(name):
    """A name without what its spelling adds."""
    return re.sub(r"[^a-z0-9]", "", name.lower())


def wanted_of(table):
    numbers = {what: {(spelt(row.get("enumerator", row["name"])), row["number"]) for row in table[what]}
               for what, _ in LISTS}
    keys = {row["name"].rstrip("*") for row in table["key"]
            if not row["name"].startswith("*") and row.get("places") != ["event"]}
    return numbers, keys


def check_c(text, numbers, keys):
    defined = DEFINED.findall(text)
    for what, prefix in C_PREFIXES.items():
        found = {(spelt(name.removeprefix(prefix)), int(number, 0)) for name, number, _ in defined
                 if name.startswith(prefix)}
        expect(f"C {what}", found, numbers[what])
    expect("C keys", {key for _, _, key in defined if key}, keys)


def check_cpp(text, numbers, keys):
    enumerations = dict(ENUMERATION.findall(text))
    for what, name in LISTS:
        found = {(spelt(each), int(number, 0)) for each, number in ENUMERATOR.findall(enumerations[name])}
        expect(f"C++ {what}", found, numbers[what])
    expect("C++ keys", {key for _, key in KEY.findall(text)}, keys)


def check_python(text, numbers, keys):
    module = {"__name__": "messages"}
    exec(compile(text, "messages.py", "exec"), module)
    for what, name in LISTS:
        assert issubclass(module[name], enum.IntEnum)
        # An enumerator of a value that another one has would be no member of its own.
        found = {(spelt(each.name), each.value) for each in module[name]}
        expect(f"Python {what}", found, numbers[what])
    expect("Python keys", {value for key, value in vars(module["Key"]).items() if key.isupper()}, keys)


def compile_headers(root, compiler):
    c_folder, cpp_folder = (os.path.join(root, "clients", *rest) for rest in (("c", "include"), ("cpp", "include")))
    c = '#include <tarnreporting_messages.h>\nconst char* key = TARN_KEY_SESSION_OUTPUT_RUNNING;\n' \
        'unsigned category = TARN_DOMAIN_DSP | TARN_CATEGORY_PLAYBACK;\n'
    cpp = '#include <tarnreporting_messages.hpp>\nusing namespace tarnreporting;\n' \
          'static_assert((Domain::DSP | Category::Playback) == Category{0x10000004});\n' \
          'static_assert(keys::kSessionOutputRunning == "session_output_running");\n'
    c_reports = '#include <tarnreporting_reports.h>\n'
    cpp_reports = '#include <tarnreporting_reports.hpp>\n'
    with tempfile.TemporaryDirectory(prefix="tarnwords") as folder:
        for language, standard, text in (("c", "c11", c), ("c++", "c++17", c), ("c++", "c++17", cpp),
                                         ("c++", "c++20", cpp), ("c", "c11", c_reports), ("c++", "c++17", c_reports),
                                         ("c++", "c++17", cpp_reports), ("c++", "c++20", cpp_reports)):
            path = os.path.join(folder, "client")
            with open(path, "w", encoding="utf-8") as file:
                file.write(text)
            subprocess.run([compiler, "-x", language, f"-std={standard}", *FLAGS, "-fsyntax-only", "-I", c_folder,
                            "-I", cpp_folder, path], check=True)


def main(root, compiler):
    with open(os.path.join(root, "dictionary", "messages.toml"), "rb") as file:
        numbers, keys = wanted_of(tomllib.load(file))
    clients = os.path.join(root, "clients")
    check_c(read(clients, "c", "include", "tarnreporting_messages.h"), numbers, keys)
    check_cpp(read(clients, "cpp", "include", "tarnreporting_messages.hpp"), numbers, keys)
    check_python(read(clients, "python", "tarnreporting", "messages.py"), numbers, keys)
    compile_headers(root, compiler)
    print(f"{len(keys)} keys in three languages")


if __name__ == "__main__":
    if len(sys.argv) != 3:
        raise SystemExit(__doc__)
    main(*sys.argv[1:])
