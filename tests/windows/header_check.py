#!/usr/bin/env python3
"""Holds the stand-in Win32 headers (platform/win32/include) against the SDK's.

The names come from the stand-in headers themselves: every object-like #define with a
value, every enumerator, typedef, struct or union (size, alignment, and each field's
offset and type) and every declared function (its type). One probe source asks the
compiler about each name; it is compiled to assembly, never linked or run, for four
targets: Linux g++ against the stand-in (64-bit and -m32) and MinGW-w64 against the
SDK's <windows.h> and <icm.h> (x86_64 and i686). Values, sizes and offsets leave the
compiler as assembly comments through "i" operands; types leave it as the mangled names
of one function per check, read back with c++filt. Linux 64-bit is compared with
x86_64 Windows and Linux 32-bit with i686 Windows.

One normalisation: `long` is written as the other standard integer type of its width
(int where long is 32-bit, as on Windows and 32-bit Linux; long long on 64-bit Linux),
since the stand-in spells the SDK's 32-bit LONG and DWORD with int32_t and uint32_t.

Mismatches listed in header_mismatches_kept.txt beside this file (one "key  reason" a
line) are reported and allowed; any other fails the check (exit 1). Exit 2 when a
compiler is missing or a probe fails to compile for another reason than a name the SDK
lacks.
"""
import argparse
import os
import re
import shutil
import subprocess
import sys
import tempfile

HERE = os.path.dirname(os.path.abspath(__file__))
ROOT = os.path.dirname(os.path.dirname(HERE))
INCLUDE = os.path.join(ROOT, "platform", "win32", "include")

# Macros that are not constants: calling conventions, checked through function types.
NOT_CONSTANTS = {"WINAPI", "CALLBACK"}

TARGETS = {
    "linux64": (["g++"], True, 64),
    "linux32": (["g++", "-m32"], True, 32),
    "mingw64": (["x86_64-w64-mingw32-g++"], False, 32),
    "mingw32": (["i686-w64-mingw32-g++"], False, 32),
}
PAIRS = [("linux64", "mingw64"), ("linux32", "mingw32")]


# ---------------------------------------------------------------- reading the headers

def strip_comments(text):
    text = re.sub(r"/\*.*?\*/", " ", text, flags=re.S)
    return re.sub(r"//[^\n]*", "", text)


def split_top(text, sep=";"):
    """Splits text at sep outside braces and parentheses; a stray closing brace (the end
    of an extern "C" block) is dropped."""
    parts, depth, cur = [], 0, []
    for ch in text:
        if ch in "{(":
            depth += 1
        elif ch in "})":
            if depth == 0:
                continue
            depth -= 1
        if ch == sep and depth == 0:
            parts.append("".join(cur).strip())
            cur = []
        else:
            cur.append(ch)
    if "".join(cur).strip():
        parts.append("".join(cur).strip())
    return parts


def declarator_name(d):
    m = re.search(r"(\w+)\s*(\[[^\]]*\])?\s*$", d)
    return m.group(1) if m else None


def record_fields(body, prefix=""):
    """Fields of a struct or union body; members of anonymous structs and unions are
    fields of the enclosing record, as C++ names them."""
    fields = []
    for member in split_top(body):
        member = " ".join(member.split())
        if not member:
            continue
        if "{" in member:
            inner = member[member.index("{") + 1:member.rindex("}")]
            after = member[member.rindex("}") + 1:].strip()
            if after:
                fields.append(declarator_name(after))
            else:
                fields.extend(record_fields(inner))
            continue
        pieces = split_top(member, ",")
        for i, p in enumerate(pieces):
            name = declarator_name(p)
            if name and (i > 0 or len(p.split()) > 1):
                fields.append(name)
    return fields


class Names:
    def __init__(self):
        self.constants = []  # macros and enumerators
        self.typedefs = []
        self.records = {}  # name usable in C++ -> fields
        self.functions = []

    def count(self):
        return (len(self.constants) + len(self.typedefs) + len(self.records) +
                len(self.functions))


def parse_header(path, names):
    with open(path) as f:
        text = strip_comments(f.read().replace("\\\n", " "))
    code = []
    for line in text.splitlines():
        m = re.match(r"\s*#\s*define\s+(\w+)(\(?)\s*(.*)$", line)
        if m:
            name, function_like, value = m.group(1), m.group(2), m.group(3).strip()
            if not function_like and value and name not in NOT_CONSTANTS:
                names.constants.append(name)
            continue
        if re.match(r"\s*#", line):
            continue
        code.append(line)
    code = re.sub(r'extern\s+"C"\s*\{', " ", "\n".join(code))
    for st in split_top(code):
        # Attributes (an alignment that matches the SDK's on 32-bit) are not names.
        st = re.sub(r"__attribute__\s*\(\((?:[^()]|\([^()]*\))*\)\)", " ", st)
        st = " ".join(st.split())
        if not st:
            continue
        m = re.match(r"DECLARE_HANDLE\((\w+)\)$", st)
        if m:
            names.typedefs.append(m.group(1))
            names.records[m.group(1) + "__"] = ["unused"]
            continue
        m = re.match(r"(typedef\s+)?(struct|union|enum)\s*(\w*)\s*\{", st)
        if m:
            body = st[st.index("{") + 1:st.rindex("}")]
            declarators = [declarator_name(d) for d in split_top(st[st.rindex("}") + 1:], ",")]
            declarators = [d for d in declarators if d]
            if m.group(1):
                names.typedefs.extend(declarators)
            record = m.group(3) or (declarators[0] if declarators else None)
            if m.group(2) == "enum":
                for e in split_top(body, ","):
                    if e.strip():
                        names.constants.append(e.split("=")[0].strip())
            elif record:
                names.records[record] = record_fields(body)
            continue
        if st.startswith("typedef"):
            m = re.search(r"\(\s*(?:\w+\s*)?\*\s*(\w+)\s*\)\s*\(", st)
            if m:
                names.typedefs.append(m.group(1))
            else:
                names.typedefs.extend(n for n in (declarator_name(d) for d in split_top(st, ",")) if n)
            continue
        m = re.search(r"(\w+)\s*\(", st)
        if m:
            names.functions.append(m.group(1))


def read_names():
    names = Names()
    for h in sorted(os.listdir(INCLUDE)):
        path = os.path.join(INCLUDE, h)
        with open(path) as f:
            # C++-only helpers of the Linux layer (win32_paths.h) are not SDK headers.
            if not h.endswith(".h") or re.search(r"^\s*namespace\b", f.read(), re.M):
                continue
        parse_header(path, names)
    return names


# ---------------------------------------------------------------- the probe

def ident(key):
    return re.sub(r"\W", "_", key)


def probe_source(names, skip):
    out = ["#include <windows.h>", "#include <icm.h>", "#include <stddef.h>",
           "#include <stdint.h>", "#include <type_traits>",
           "template <class T> struct P {};",
           "template <class T> constexpr unsigned long long SizeOf() {",
           "  if constexpr (std::is_void_v<T> || std::is_function_v<T>) return 0; else return sizeof(T);",
           "}",
           "template <class T> constexpr unsigned long long AlignOf() {",
           "  if constexpr (std::is_void_v<T> || std::is_function_v<T>) return 0; else return alignof(T);",
           "}",
           "#define TW_BITS(v) (unsigned long long)(uintptr_t)(v)",
           "#define TW_VALUE(key, v) asm volatile(\"# @@ \" key \" %c0 %c1\" :: "
           "\"i\"((unsigned)(TW_BITS(v) & 0xFFFFFFFFu)), \"i\"((unsigned)(TW_BITS(v) >> 32)))"]
    types, values = [], []

    def typ(key, t):
        types.append("void tw_%s(P<%s>*) {}" % (ident(key), t))

    def val(key, v):
        values.append("  TW_VALUE(\"%s\", %s);" % (key, v))

    for c in names.constants:
        if c in skip:
            continue
        typ("const.%s.type" % c, "decltype(%s)" % c)
        val("const.%s.value" % c, c)
    for t in names.typedefs:
        if t in skip:
            continue
        typ("typedef.%s" % t, t)
        val("typedef.%s.size" % t, "SizeOf<%s>()" % t)
        val("typedef.%s.align" % t, "AlignOf<%s>()" % t)
    for r, fields in names.records.items():
        if r in skip:
            continue
        val("record.%s.size" % r, "sizeof(%s)" % r)
        val("record.%s.align" % r, "alignof(%s)" % r)
        for f in fields:
            val("record.%s.%s.offset" % (r, f), "offsetof(%s, %s)" % (r, f))
            typ("record.%s.%s.type" % (r, f), "decltype(%s::%s)" % (r, f))
    for fn in names.functions:
        if fn in skip:
            continue
        typ("function.%s" % fn, "decltype(%s)" % fn)
    return "\n".join(out + types + ["void tw_values() {"] + values + ["}"]) + "\n"


def normalise_long(text, long_bits):
    text = re.sub(r"\blong long\b", "\0", text)
    text = re.sub(r"\blong\b", "int" if long_bits == 32 else "long long", text)
    return text.replace("\0", "long long")


def run_probe(target, names, work):
    command, linux, long_bits = TARGETS[target]
    if not shutil.which(command[0]):
        raise SystemExit("header_check: %s not found (bash scripts/setup.sh --windows)" % command[0])
    skip, missing = set(), []
    src = os.path.join(work, target + ".cpp")
    asm = os.path.join(work, target + ".s")
    flags = ["-std=c++17", "-O2", "-S", "-w", "-o", asm, src]
    if linux:
        flags = ["-I", INCLUDE] + flags
    for _ in range(50):
        with open(src, "w") as f:
            f.write(probe_source(names, skip))
        r = subprocess.run(command + flags, capture_output=True, text=True,
                           env=dict(os.environ, LC_ALL="C"))  # plain quotes in messages
        if r.returncode == 0:
            break
        # A name the compiler does not know: the SDK lacks it. Report it and go on.
        unknown = set(re.findall(r"'(\w+)' (?:was not declared|has not been declared|"
                                 r"does not name a type|is not a member of)", r.stderr))
        unknown |= set(re.findall(r"'(\w+)' was not declared in this scope", r.stderr))
        unknown |= set(re.findall(r"incomplete type '(?:struct |union )?(\w+)'", r.stderr))
        unknown -= skip
        if not unknown:
            sys.stderr.write(r.stderr[-4000:])
            raise SystemExit("header_check: the %s probe does not compile" % target)
        skip |= unknown
        missing.extend(sorted(unknown))
    facts = {}
    with open(asm) as f:
        text = f.read()
    for m in re.finditer(r"# @@ (\S+) (-?\d+) (-?\d+)", text):
        lo, hi = int(m.group(2)) & 0xFFFFFFFF, int(m.group(3)) & 0xFFFFFFFF
        facts[m.group(1)] = "%d" % (hi << 32 | lo)
    mangled = sorted(set(re.findall(r"\b_?(_Z\d+tw_\w+)", text)))
    demangled = subprocess.run(["c++filt"], input="\n".join(mangled), capture_output=True,
                               text=True, check=True).stdout.splitlines()
    keys = {ident(k): k for k in probe_keys(names)}
    for d in demangled:
        m = re.match(r"tw_(\w+)\(P<(.*)>\*\)$", d)
        if m and m.group(1) in keys:
            facts[keys[m.group(1)]] = normalise_long(m.group(2), long_bits)
    for name in missing:
        facts["missing." + name] = "not declared"
    return facts


def probe_keys(names):
    keys = ["const.%s.type" % c for c in names.constants]
    keys += ["typedef.%s" % t for t in names.typedefs]
    keys += ["record.%s.%s.type" % (r, f) for r, fs in names.records.items() for f in fs]
    keys += ["function.%s" % f for f in names.functions]
    return keys


def read_kept():
    kept = {}
    path = os.path.join(HERE, "header_mismatches_kept.txt")
    if os.path.exists(path):
        with open(path) as f:
            for line in f:
                line = line.strip()
                if line and not line.startswith("#"):
                    key, _, reason = line.partition(" ")
                    kept[key] = reason.strip()
    return kept


def compare(a, b):
    """Keys whose facts differ between two targets, with both facts."""
    return [(k, a.get(k, "absent"), b.get(k, "absent"))
            for k in sorted(set(a) | set(b)) if a.get(k) != b.get(k)]


def main():
    parser = argparse.ArgumentParser(description=__doc__.split("\n\n")[0])
    parser.add_argument("--list", action="store_true", help="print every fact of every target")
    parser.add_argument("--include", metavar="DIR", help="the stand-in headers to check "
                        "(default: platform/win32/include)")
    args = parser.parse_args()
    if args.include:
        global INCLUDE
        INCLUDE = os.path.abspath(args.include)
    names = read_names()
    kept = read_kept()
    with tempfile.TemporaryDirectory() as work:
        facts = {t: run_probe(t, names, work) for t in TARGETS}
    if args.list:
        for t, f in facts.items():
            for k in sorted(f):
                print("%s %s %s" % (t, k, f[k]))
    unexplained = 0
    for linux, windows in PAIRS:
        diffs = compare(facts[linux], facts[windows])
        for key, ours, sdk in diffs:
            reason = kept.get(key)
            tag = "kept (%s)" % reason if reason else "MISMATCH"
            unexplained += reason is None
            print("%s/%s %s: stand-in %s, SDK %s -- %s" % (linux, windows, key, ours, sdk, tag))
        print("%s against %s: %d facts, %d differ" % (linux, windows, len(facts[linux]), len(diffs)))
    print("header check: %d names (%d constants, %d typedefs, %d records, %d functions), "
          "%d unexplained mismatches" % (names.count(), len(names.constants), len(names.typedefs),
                                        len(names.records), len(names.functions), unexplained))
    return 1 if unexplained else 0


if __name__ == "__main__":
    sys.exit(main())
