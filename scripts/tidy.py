#!/usr/bin/env python3
"""Runs clang-tidy over the product's sources: scripts/tidy.py [--build DIR] [FILE...]

Nearly all of the time goes into the standard library's and Boost's headers, which every source includes. So the sources of a
folder that share no name are looked at as one: a second a file instead of ten. Files that are named are looked at alone.

DIR is a build folder that was configured with clang (default build/werror-clang++). Answers 1 if there is a finding.
"""
import argparse
import concurrent.futures
import json
import os
import pathlib
import re
import shlex
import subprocess
import sys
import tempfile

ROOT = pathlib.Path(__file__).resolve().parent.parent
FOLDERS = ["frame", "services", "tree", "keystore", "curves", "persist", "overrides", "identity", "host", "cli"]
# Sources too: of a group, clang-tidy takes them for headers.
OURS = f"^{ROOT}/({'|'.join(FOLDERS)})/"
# What opens a declaration in an unnamed namespace; too many names only make more groups.
NAME = re.compile(r"^\w[\w:<>,*& ]*?\b(\w+)(?:\(|\[| =| \{|;|$)", re.M)
FINDING = re.compile(r"^.*(?:warning|error): .*$", re.M)


def compile_flags(build):
    """Source -> the flags that it is compiled with."""
    flags = {}
    for entry in json.loads((build / "compile_commands.json").read_text()):
        words = shlex.split(entry["command"])
        compiler = next(i for i, word in enumerate(words) if "clang++" in pathlib.Path(word).name)
        output = words.index("-o")
        words = words[compiler + 1 : output] + words[output + 2 :]
        source = pathlib.Path(entry["directory"], entry["file"]).resolve()
        flags[source] = [word for word in words if word not in ("-c", "-Werror") and not word.endswith(".cpp")]
    return flags


def own_names(source):
    """The names that a source gives to what nobody else sees."""
    names = set()
    for block in re.findall(r"^namespace \{$(.*?)^\}  // namespace$", source.read_text(), re.M | re.S):
        names.update(NAME.findall(block))
    names.update(re.findall(r"^static .*?\b(\w+)\(", source.read_text(), re.M))
    return names


def groups(sources, flags):
    """Sources with the same flags, in one folder, that can be read one behind the other."""
    open_groups = []
    for source in sources:
        names = own_names(source)
        key = (source.relative_to(ROOT).parts[0], tuple(flags[source]))
        for group in open_groups:
            if group["key"] == key and not group["names"] & names:
                break
        else:
            group = {"key": key, "names": set(), "sources": []}
            open_groups.append(group)
        group["names"] |= names
        group["sources"].append(source)
    return [group["sources"] for group in open_groups]


def tidy(source, flags):
    """What clang-tidy finds in a source and the headers of ours that it includes."""
    run = subprocess.run(
        ["clang-tidy", "--quiet", f"--config-file={ROOT / '.clang-tidy'}", f"--header-filter={OURS}", source, "--", *flags],
        cwd=ROOT, capture_output=True, text=True)
    if run.returncode < 0:
        raise RuntimeError(f"clang-tidy ended by signal {-run.returncode}")
    return run.stdout


def look_at(sources, flags, folder):
    """A group as one source; where that doesn't compile, each alone."""
    if len(sources) > 1:
        with tempfile.NamedTemporaryFile("w", suffix=".cpp", dir=folder, delete=False) as together:
            together.writelines(f'#include "{source}"\n' for source in sources)
        found = tidy(together.name, flags[sources[0]])
        if "[clang-diagnostic-error]" not in found:
            return "".join(line for line in found.splitlines(True) if not line.startswith(together.name))
    return "".join(tidy(source, flags[source]) for source in sources)


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--build", default="build/werror-clang++", help="folder configured with clang")
    parser.add_argument("files", nargs="*", help="sources to look at, each alone (default: all of the product)")
    options = parser.parse_args()

    build = ROOT / options.build
    if not (build / "compile_commands.json").exists():
        sys.exit(f"tidy.py: {options.build} isn't configured; .ci/run does it, or --build names another folder")
    flags = compile_flags(build)
    if options.files:
        work = [[pathlib.Path(file).resolve()] for file in options.files]
        unknown = [str(sources[0]) for sources in work if sources[0] not in flags]
        if unknown:
            sys.exit("tidy.py: not built in " + options.build + ": " + ", ".join(unknown))
    else:
        work = groups(sorted(s for s in flags if s.is_relative_to(ROOT) and s.relative_to(ROOT).parts[0] in FOLDERS), flags)
    work.sort(key=len, reverse=True)

    findings = {}
    with tempfile.TemporaryDirectory() as folder, concurrent.futures.ThreadPoolExecutor(os.cpu_count()) as pool:
        for text in pool.map(lambda sources: look_at(sources, flags, folder), work):
            for line in FINDING.findall(text):
                findings.setdefault(line.replace(f"{ROOT}/", ""), None)
    print("\n".join(sorted(findings)) or f"Nothing found in {sum(map(len, work))} files.")
    return 1 if findings else 0


if __name__ == "__main__":
    sys.exit(main())
