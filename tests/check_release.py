#!/usr/bin/env python3
"""Checks the shipped DLLs of one architecture as release files.

For each DLL: no debug sections left; a .gnu_debuglink naming NAME.dll.debug beside it, with
the CRC-32 of that file, which holds the debug information; a PE header time stamp of 0; no
trace of the source or build folder in the DLL or its debug file. Then dist/ (dist/x64/ for
x64): each DLL there is the checked one, byte for byte, and nothing else is there but what a
user ships.
"""
import argparse
import pathlib
import re
import subprocess
import zlib

# What may sit in dist/ (x86) or dist/x64/: the loose files, the x64 folder, and what
# `make dist` adds (one zip per architecture and SHA256SUMS).
SHIPPED = {
    "x86": re.compile(r"libTessel_JNI\.dll|libZelbrin\.dll|tessel-coreutil\.jar|x64|SHA256SUMS|"
                      r"libTessel_JNI-[\d.]+-windows-x(86|64)\.zip"),
    "x64": re.compile(r"libTessel_JNI\.dll|libZelbrin\.dll"),
}


def objdump(tool, *args):
    return subprocess.run([tool, *args], check=True, capture_output=True, text=True).stdout


def section_names(tool, path):
    return re.findall(r"^\s*\d+\s+(\S+)", objdump(tool, "-h", str(path)), re.M)


def section_bytes(tool, path, name):
    out = objdump(tool, "-s", "-j", name, str(path))
    data = bytearray()
    for line in out.splitlines():
        m = re.match(r"^ [0-9a-f]+ ((?:[0-9a-f]{1,8} ){1,4})", line)
        if m:
            data += bytes.fromhex(m.group(1).replace(" ", ""))
    return bytes(data)


def check_dll(tool, dll, folders):
    failures = []
    sections = section_names(tool, dll)
    if any(s.startswith(".debug") for s in sections):
        failures.append("%s keeps debug sections" % dll.name)
    debug = dll.with_name(dll.name + ".debug")
    if ".gnu_debuglink" not in sections:
        failures.append("%s has no debug link" % dll.name)
    elif not debug.is_file():
        failures.append("%s: no %s beside it" % (dll.name, debug.name))
    else:
        link = section_bytes(tool, dll, ".gnu_debuglink")
        name = link[:link.index(b"\0")].decode()
        crc = int.from_bytes(link[-4:], "little")
        if name != debug.name:
            failures.append("%s links to %s, not %s" % (dll.name, name, debug.name))
        if crc != zlib.crc32(debug.read_bytes()):
            failures.append("%s: the link's CRC does not match %s" % (dll.name, debug.name))
        if ".debug_info" not in section_names(tool, debug):
            failures.append("%s holds no debug information" % debug.name)
    stamp = re.search(r"^Time/Date\s+(.*)$", objdump(tool, "-p", str(dll)), re.M).group(1)
    if "1970" not in stamp:
        failures.append("%s carries the time stamp %s" % (dll.name, stamp))
    for path in (dll, debug):
        if path.is_file():
            data = path.read_bytes()
            for folder in folders:
                if folder.encode() in data:
                    failures.append("%s contains the path %s" % (path.name, folder))
    return failures


def main():
    ap = argparse.ArgumentParser()
    ap.add_argument("--arch", choices=("x86", "x64"), required=True)
    ap.add_argument("--objdump", required=True)
    ap.add_argument("--dist", required=True)
    ap.add_argument("--source", required=True)
    ap.add_argument("--build", required=True)
    ap.add_argument("dlls", nargs="+")
    a = ap.parse_args()

    failures = []
    folders = sorted({a.source, a.build, str(pathlib.Path(a.build).resolve())})
    for dll in map(pathlib.Path, a.dlls):
        failures += check_dll(a.objdump, dll, folders)
        shipped = pathlib.Path(a.dist) / dll.name
        if not shipped.is_file() or shipped.read_bytes() != dll.read_bytes():
            failures.append("%s is not the checked %s" % (shipped, dll.name))
    for entry in sorted(pathlib.Path(a.dist).iterdir()):
        if not SHIPPED[a.arch].fullmatch(entry.name):
            failures.append("%s does not belong in %s" % (entry.name, a.dist))

    print("%s: %s checked" % (a.arch, ", ".join(pathlib.Path(d).name for d in a.dlls)))
    for failure in failures:
        print("FAIL: " + failure)
    return 1 if failures else 0


if __name__ == "__main__":
    raise SystemExit(main())
