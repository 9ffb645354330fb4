#!/usr/bin/env python3
"""Checks a built DLL's export and import tables against the compiled Java classes.

The expected names are derived from `javap -s` output, not from the .def files.
x86: the JNI short name, or the long name for overloaded natives that take arguments,
decorated as _name@bytes with 4 bytes per slot (8 for the env and object, 8 for a long).
x64: plain names; without @N the short name of an overload would also be found for its
other forms, so every form of an overloaded native has its long name (even the one without
arguments: name__).
Then each native is resolved the way a Windows JVM of that architecture looks it up (short
name first, then long name, decorated on x86), and every native must land on its own export.
"""
import argparse
import pathlib
import re
import subprocess
import sys

ALLOWED_IMPORTS = {"kernel32.dll", "user32.dll", "shell32.dll", "comdlg32.dll", "advapi32.dll",
                   "msvcrt.dll", "libzelbrin.dll"}


def mangle(text):
    out = []
    for ch in text:
        if ch == "/":
            out.append("_")
        elif ch == "_":
            out.append("_1")
        elif ch == ";":
            out.append("_2")
        elif ch == "[":
            out.append("_3")
        elif ch.isascii() and ch.isalnum():
            out.append(ch)
        else:
            out.append("_0%04x" % ord(ch))
    return "".join(out)


def arg_descriptors(desc):
    """Splits "(I[BLjava/lang/String;)V" into ["I", "[B", "Ljava/lang/String;"]."""
    inner = desc[1:desc.index(")")]
    args, i = [], 0
    while i < len(inner):
        j = i
        while inner[j] == "[":
            j += 1
        if inner[j] == "L":
            j = inner.index(";", j)
        args.append(inner[i:j + 1])
        i = j + 1
    return args


def native_methods(javap, classes_dir):
    methods = []
    for cls in sorted(pathlib.Path(classes_dir).rglob("*.class")):
        name = cls.relative_to(classes_dir).with_suffix("").as_posix()
        out = subprocess.run([javap, "-s", "-p", "-cp", str(classes_dir), name.replace("/", ".")],
                             check=True, capture_output=True, text=True).stdout
        lines = out.splitlines()
        for k, line in enumerate(lines):
            m = re.search(r"\bnative\b.*?\b(\w+)\(", line)
            if m:
                desc = lines[k + 1].split("descriptor:")[1].strip()
                methods.append((name, m.group(1), desc))
    return methods


def expected_exports(methods, arch):
    counts = {}
    for cls, meth, _ in methods:
        counts[(cls, meth)] = counts.get((cls, meth), 0) + 1
    result = {}
    for cls, meth, desc in methods:
        args = arg_descriptors(desc)
        size = 8 + sum(8 if a in ("J", "D") else 4 for a in args)
        short = "Java_" + mangle(cls) + "_" + mangle(meth)
        long_name = short + "__" + mangle("".join(args))
        overloaded = counts[(cls, meth)] > 1
        if arch == "x64":
            chosen = long_name if overloaded else short
            result[(cls, meth, desc)] = (short, long_name, chosen)
            continue
        # An overload without arguments keeps the short name (its @N tells it apart); one
        # with arguments is exported under its long name.
        chosen = long_name if overloaded and args else short
        result[(cls, meth, desc)] = ("_%s@%d" % (short, size), "_%s@%d" % (long_name, size),
                                     "_%s@%d" % (chosen, size))
    return result


def dll_tables(objdump, dll):
    text = subprocess.run([objdump, "-p", dll], check=True, capture_output=True, text=True).stdout
    imports = {m.group(1).lower() for m in re.finditer(r"DLL Name: (\S+)", text)}
    exports = {}
    section = text.split("[Ordinal/Name Pointer] Table", 1)
    if len(section) == 2:
        for line in section[1].splitlines():
            m = re.match(r"\s+\[\s*\d+\]\s+(\S+)", line)
            if not m:
                if line.strip():
                    break
                continue
            exports[m.group(1)] = True
    rvas = {}
    for m in re.finditer(r"^\s+\[\s*\d+\] \+base\[\s*\d+\]\s+([0-9a-f]+) Export RVA", text, re.M):
        rvas.setdefault("_list", []).append(m.group(1))
    return imports, set(exports), rvas.get("_list", [])


def main():
    ap = argparse.ArgumentParser()
    ap.add_argument("--arch", choices=("x86", "x64"), default="x86")
    ap.add_argument("--dll", required=True)
    ap.add_argument("--classes", required=True)
    ap.add_argument("--javap", required=True)
    ap.add_argument("--objdump", required=True)
    ap.add_argument("--require-all", action="store_true",
                    help="every native method must be exported")
    a = ap.parse_args()

    failures = []
    methods = native_methods(a.javap, a.classes)
    expected = expected_exports(methods, a.arch)
    imports, exports, rvas = dll_tables(a.objdump, a.dll)

    designated = {v[2] for v in expected.values()}
    implemented = {k: v for k, v in expected.items() if v[2] in exports}
    for name in sorted(exports - designated):
        failures.append("export not derived from any Java native method: " + name)

    # The lookup a Windows JVM makes: short name, then long name (decorated on x86).
    resolved = {}
    for key, (short, long_name, chosen) in implemented.items():
        hit = short if short in exports else long_name if long_name in exports else None
        if hit != chosen:
            failures.append("%s.%s%s resolves to %s, not %s" % (key + (hit, chosen)))
        if hit in resolved:
            failures.append("%s and %s both resolve to %s" % (resolved[hit], key, hit))
        resolved[hit] = key
    if len(set(rvas)) != len(rvas):
        failures.append("two exports share one function address")

    for dll in sorted(imports - ALLOWED_IMPORTS):
        failures.append("imports a DLL outside the allowed set: " + dll)

    print("%s: %d native methods in the Java classes, %d exported, imports: %s"
          % (a.arch, len(expected), len(exports), ", ".join(sorted(imports))))
    for name in sorted(exports):
        print("  " + name)
    missing = sorted(v[2] for k, v in expected.items() if v[2] not in exports)
    if missing:
        print("%d natives not exported: %s" % (len(missing), ", ".join(missing)))
        if a.require_all:
            failures.append("natives without an export")
    if failures:
        print("\n".join("FAIL: " + f for f in failures))
        return 1
    return 0


if __name__ == "__main__":
    sys.exit(main())
