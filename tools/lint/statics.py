# SPDX-License-Identifier: Apache-2.0
"""Where state of the process may live: in service/vocabulary/ProcessState.cpp alone.

Elsewhere the product has no mutable variable at namespace scope and no mutable static, in a function or in a class;
what is constant is fine. Atomics count as mutable, and so does a constant pointer, reference or smart pointer to what
isn't constant. A global that is made by `name(value)` looks like a function unless the value is a literal.
"""

import re

from tree import Finding, code_only

HOME = "service/vocabulary/ProcessState.cpp"
PRODUCT = ("adapters/", "client/", "clients/", "derived/", "diagnostics/", "dictionary/", "fleet/", "host/",
           "platform/", "plist/", "recorder/", "service/", "session/", "telemetry/", "testing/", "tools/ctl/",
           "tools/manual/", "tools/report/", "tools/script/", "wire/")
# (file, variable): why it can't live in the home.
EXCEPTIONS = {
    ("plist/Key.cpp", "instance"): "one copy of each text that never changes; keys are made before main",
    ("plist/KeyList.cpp", "instance"): "one copy of each key list that never changes, likewise",
    ("tools/ctl/terminal/StopRequest.cpp", "stopRequested"): "a signal handler reaches nothing else",
    ("recorder/store/files/MappedGuard.cpp", "guarded"): "a signal handler reaches nothing else",
    ("recorder/store/files/MappedGuard.cpp", "once"): "the handler is installed once a process",
    **{("clients/c/src/Forks.cpp", name): "fork() happens to the whole process that loaded the library"
       for name in ("mutex", "once", "first")},
    ("host/loop/CurrentQueue.h", "current_"): "which queue a thread serves belongs to the thread",
    ("host/log/LogClient.h", "current_"): "for whom a thread works belongs to the thread",
    ("host/loop/WorkLane.h", "current_"): "and so does whose work of it that is",
    ("host/loop/WorkOwner.h", "current_"): "for which session a thread works belongs to the thread",
    ("platform/LogCondition.h", "current_"): "what a thread just logs about belongs to the thread",
    ("testing/backends/RecordingSessionRecords.h", "current_"): "and so it does in tests",
    ("testing/backends/OwnMemory.h", "depth_"): "what a fake does on a thread belongs to the thread",
    ("host/system/MemoryReserve.h", "refusable_"): "whether a thread's work may be refused belongs to the thread",
    ("host/system/MemoryReserve.cpp", "reserve"): "operator new and its handler are the process's",
}

OTHER = re.compile(r"(?:using|typedef|static_assert|friend|template|concept|namespace|class|struct|union|enum|extern|"
                   r"__extension__|asm|return|goto|requires)\b")
KEPT = re.compile(r"\b(?:static|thread_local)\b")
TYPE = re.compile(r"\b(?:class|struct|union)\b")
SMART = re.compile(r"\b(?:(?:shared|unique|weak)_ptr|make_(?:shared|unique))\s*<\s*(?!const\b)")
NOISE = re.compile(r"\[\[.*?\]\]|\b(?:public|private|protected|default|case[^:;]*)\s*:(?!:)|->", re.DOTALL)
NAME = re.compile(r"([A-Za-z_]\w*)\s*(?:\[[^\]]*\]\s*)*$")
# What stands after the closing brace of an initialiser or a lambda, and not of a block.
CARRIES_ON = ";,)].(<>+-*/%&|^?!="
FOLLOWING = re.compile(r"\s*(.?)")
LITERAL = re.compile(r"\(\s*(?:[-\d\"']|(?:true|false|nullptr)\b)")


def check(tree):
    findings = []
    for path, text in tree.cxx().items():
        if path.startswith(PRODUCT) and path != HOME:
            findings += [Finding(path, line, f"{name} is state of the process: that lives in ProcessState")
                         for line, name in statics(text) if (path, name) not in EXCEPTIONS]
    return sorted(findings)


def statics(text):
    """(line, name) of each mutable variable that lives as long as the program or a thread."""
    code = re.sub(r"^[ \t]*#(?:[^\n\\]|\\.|\\\n)*", blank, code_only(text), flags=re.MULTILINE)
    for start, end, scope in statements(code):
        if name := mutable_name(code[start:end], text[start:end], scope):
            yield code.count("\n", 0, end) + 1, name


def blank(found):
    return re.sub(r"[^\n]", " ", found.group(0))


def statements(code):
    """(begin, end, scope) of each statement that ends with a semicolon; a scope is namespace, class, enum or code."""
    scope, start, depth, outer = "namespace", 0, 0, []
    for at, char in enumerate(code):
        if char in "()":
            depth += 1 if char == "(" else -1
        elif char == "{":
            outer.append((scope, start, depth))
            scope, start, depth = scope_after(code[start:at], scope), at + 1, 0
        elif char == "}" and outer:
            scope, begun, depth = outer.pop()
            following = FOLLOWING.match(code, at + 1).group(1)
            start = begun if following and following in CARRIES_ON else at + 1
        elif char == ";" and depth == 0:
            yield start, at, scope
            start = at + 1


def scope_after(head, scope):
    """The scope that a brace after this text opens."""
    head = without_templates(head)
    if re.search(r"\benum\b", head):
        return "enum"
    if re.search(r"\bnamespace\b|\bextern\s*$", head):
        return "namespace"
    return "class" if TYPE.search(head) and "(" not in head and "=" not in head else "code"


def without_templates(text):
    """The text without attributes, labels and what stands in angle brackets."""
    text, before = NOISE.sub(blank, text), ""
    while text != before:
        before, text = text, re.sub(r"<[^<>;{}]*>", blank, text)
    return text


def mutable_name(code, text, scope):
    """The name of the variable that this statement declares, when it is mutable and lives on."""
    plain = without_templates(code)
    end = min((at for at in (plain.find("="), plain.find("{")) if at >= 0), default=len(plain))
    declared = plain[:end].rstrip()
    if scope == "enum" or OTHER.match(declared.lstrip()) or "operator" in declared:
        return None
    if scope != "namespace" and not KEPT.search(declared):
        return None
    bracket = declared.find("(")
    if bracket >= 0:
        if scope != "code" and not LITERAL.match(text, bracket):
            return None  # a function
        declared = declared[:bracket].rstrip()
    name = NAME.search(declared)
    if not name or "constexpr" in declared or (is_constant(declared[:name.start()]) and not SMART.search(code)):
        return None
    return name.group(1)


def is_constant(kind):
    """Whether a variable of this type never changes, nor what it points to."""
    *pointees, last = re.split(r"[*&]", kind)
    if "&" in kind:
        return all(re.search(r"\bconst\b", each) for each in pointees)
    return all(re.search(r"\bconst\b", each) for each in (*pointees, last))

