# SPDX-License-Identifier: Apache-2.0
"""Makes the completions of bash, zsh and fish from the programs' own tables (docs/manual/commands.json).

usage: completions.py bash|zsh|fish PROGRAM
"""

import sys

import pages

FILES = ("FILE", "PATH")
FOLDERS = ("DIR",)


def names(command):
    return [name for option in command["options"] for name in option["names"]]


def path_of(option):
    value = option.get("positional") or option.get("value", "")
    return "files" if value in FILES or value.endswith("|FILE") else "folders" if value in FOLDERS else ""


def quoted(text):
    return "'" + text.replace("'", "'\\''") + "'"


def commands_with_paths(program):
    """(words of the command, the command), the program itself first."""
    found = [((), program)]
    for command in program["commands"]:
        found += [((command["name"], *words), inner) for words, inner in commands_with_paths(command)]
    return found


def first_line(text):
    return " ".join(text.split())


# --- bash ---

BASH = """# Completions of {program}.
_{program}() {{
  local word=${{COMP_WORDS[COMP_CWORD]}} before=${{COMP_WORDS[COMP_CWORD-1]}} command='' candidate
  for candidate in "${{COMP_WORDS[@]:1:COMP_CWORD-1}}"; do
    case "${{command:+$command }}$candidate" in
{commands}      *) ;;
    esac
  done
  COMPREPLY=()
  case "$before" in
{values}  esac
  case "$command" in
{words}  esac
}}
complete -F _{program} {program}
"""
BASH_PATH = {"files": "compgen -f", "folders": "compgen -d", "": ":"}


def bash_value(option):
    labels = "|".join(option["names"])
    if "choices" in option:
        take = f'mapfile -t COMPREPLY < <(compgen -W {quoted(" ".join(option["choices"]))} -- "$word")'
    elif path_of(option):
        take = f'mapfile -t COMPREPLY < <({BASH_PATH[path_of(option)]} -- "$word")'
    else:
        take = ":"
    return f"    {labels}) {take}; return ;;\n"


def bash(program):
    every = commands_with_paths(program)
    values = {}
    for _, command in every:
        for option in command["options"]:
            if option["names"] and "value" in option and not option["value"].startswith("["):
                values.setdefault(option["names"][-1], bash_value(option))
    words = ""
    for path, command in every:
        offered = names(command) + (names(program) if path else []) + [inner["name"] for inner in command["commands"]]
        positional = [option for option in command["options"] if not option["names"]]
        kind = next((path_of(option) for option in positional if path_of(option)), "")
        files = f'; [[ $word == -* ]] || mapfile -t COMPREPLY < <({BASH_PATH[kind]} -- "$word")' if kind else ""
        words += (f'    {quoted(" ".join(path))}) mapfile -t COMPREPLY < <(compgen -W '
                  f'{quoted(" ".join(dict.fromkeys(offered)))} -- "$word"){files} ;;\n')
    known = "".join(f'      {quoted(" ".join(path))}) command={quoted(" ".join(path))} ;;\n'
                    for path, _ in every if path)
    return BASH.format(program=program["name"], commands=known, values="".join(values.values()), words=words)


# --- zsh ---

def zsh_text(text):
    return first_line(text).replace("\\", "\\\\").replace("[", "\\[").replace("]", "\\]").replace(":", "\\:")


def zsh_value(option):
    if "choices" in option:
        return f":{option['value']}:({' '.join(option['choices'])})"
    action = {"files": "_files", "folders": "_files -/", "": ""}[path_of(option)]
    return f":{option['value'].replace(':', '')}:{action}"


def zsh_options(command):
    arguments = []
    for option in command["options"]:
        value = zsh_value(option) if "value" in option and not option["value"].startswith("[") else ""
        if option["names"]:
            arguments += [quoted(f"{name}[{zsh_text(option['text'])}]{value}") for name in option["names"]]
        else:
            name = option["positional"].replace(":", "")
            arguments.append(quoted(f":{name}:{'_files' if path_of(option) == 'files' else ''}"))
    return arguments


def zsh_function(words, command, common):
    """The function of a command, after those of the commands below it."""
    below = "".join(zsh_function((*words, inner["name"]), inner, common) for inner in command["commands"])
    name = "_" + "_".join(words)
    arguments = zsh_options(command) + (common if len(words) > 1 else [])
    arguments = [argument for argument in arguments if not (command["commands"] and argument.startswith("':"))]
    if not command["commands"]:
        return below + f"{name}() {{\n  _arguments -s \\\n    " + " \\\n    ".join(arguments) + "\n}\n"
    listed = " ".join(quoted(f"{inner['name']}:{first_line(inner['text'])}") for inner in command["commands"])
    cases = "".join(f"    {inner['name']}) {name}_{inner['name']} ;;\n" for inner in command["commands"])
    shown = " \\\n    ".join([*arguments, "'1: :->command'", "'*:: :->rest'"])
    return below + (f"{name}() {{\n  local context state line\n  local -a commands=({listed})\n"
                    f"  _arguments -s -C \\\n    {shown}\n"
                    "  case $state in\n  command) _describe command commands ;;\n  rest)\n    case ${line[1]} in\n"
                    + cases + "    esac ;;\n  esac\n}\n")


def zsh(program):
    common = [argument for argument in zsh_options(program) if not argument.startswith(("'-h", "'--help"))]
    name = program["name"]
    return f"#compdef {name}\n" + zsh_function((name,), program, common) + f'_{name} "$@"\n'


# --- fish ---

def fish_option(option, condition):
    words = []
    for name in option["names"]:
        words.append(f"-l {name[2:]}" if name.startswith("--") else f"-s {name[1:]}")
    if "value" in option and not option["value"].startswith("["):
        words.append("-x" if not path_of(option) else "-rF")
    if "choices" in option:
        words.append(f"-a {quoted(' '.join(option['choices']))}")
    return f"{condition} {' '.join(words)} -d {quoted(first_line(option['text']))}"


def fish(program):
    name = program["name"]
    out = [f"# Completions of {name}.", f"complete -c {name} -f"]
    for path, command in commands_with_paths(program):
        seen = "; and ".join(f"__fish_seen_subcommand_from {word}" for word in path)
        condition = f"complete -c {name}" + (f" -n {quoted(seen)}" if seen else "")
        out += [fish_option(option, condition) for option in command["options"] if option["names"]]
        if any(path_of(option) for option in command["options"] if not option["names"]):
            out.append(f"{condition} -F")
        if command["commands"]:
            inner = [below["name"] for below in command["commands"]]
            alone = f"not __fish_seen_subcommand_from {' '.join(inner)}"
            when = f"complete -c {name} -n {quoted(seen + '; and ' + alone if seen else alone)}"
            out += [f"{when} -a {below['name']} -d {quoted(first_line(below['text']))}"
                    for below in command["commands"]]
    return "\n".join(out) + "\n"


def main(arguments):
    makers = {"bash": bash, "zsh": zsh, "fish": fish}
    if len(arguments) != 2 or arguments[0] not in makers:
        raise SystemExit(__doc__)
    sys.stdout.reconfigure(encoding="utf-8")  # whatever the locale
    sys.stdout.write(makers[arguments[0]](pages.commands()[arguments[1]]))


if __name__ == "__main__":
    main(sys.argv[1:])
