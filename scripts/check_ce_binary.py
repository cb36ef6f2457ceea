"""Holds the library for Windows CE, as it was built, against what the device can carry out.

usage: check_ce_binary.py [BUILD]      (BUILD: build/ce)

The compiler's flags say most of this already; here is looked at what came out of them, with tools
that had no part in making it. BUILD has orvenix.elf, orvenix_check.elf (the same objects linked at
another base), orvenix.dll, orvenix.lib and the converter.

Code. The device's processors know the instructions of version 4T, and no more. Its callers may be
Thumb code, so whatever returns does so by BX. And its callers keep the stack at multiples of 4 only,
where the compiler believes in 8: that shows when an address is rounded to 8 bytes, which is what
reading a 64-bit argument of a variadic function does, or when the stack pointer, or a copy of it, is
taken for round.
Sources that round something else are listed in platform/ce/reviewed_code.txt.

Variadic calls. No argument may have 64 bits, or be of floating point. Every variadic function here
takes a format, whose arguments the compiler compares with it (-Wformat=2, an error): so it is enough
that each has the attribute, and that no format has a conversion of more than 32 bits. The device's
own take wide formats, which the compiler does not read: calls to those are compiled once more, with
the types of their arguments checked.
"""

import json
import pathlib
import re
import shlex
import shutil
import subprocess
import sys
import tempfile

ROOT = pathlib.Path(__file__).resolve().parent.parent
sys.path.insert(0, str(ROOT / "platform/ce"))
sys.dont_write_bytecode = True

import import_veneers  # noqa: E402

LARGEST_DLL = 160 * 1024

CONDITION = "(?:eq|ne|cs|cc|mi|pl|vs|vc|hi|ls|ge|lt|gt|le)?"
# Everything of version 4T that a library of functions has a use for.
KNOWN = re.compile(
    rf"(?:(?:adc|add|and|bic|eor|mov|mvn|orr|rsb|rsc|sbc|sub|lsl|lsr|asr|ror|rrx|mul|mla|umull|umlal|"
    rf"smull|smlal)s?{CONDITION}|(?:cmn|cmp|teq|tst)p?{CONDITION}|(?:b|bl|bx){CONDITION}|"
    rf"(?:ldr|str)b?{CONDITION}|(?:ldrh|ldrsb|ldrsh|strh){CONDITION}|"
    rf"(?:ldm|stm)(?:ia|ib|da|db)?{CONDITION}|(?:push|pop){CONDITION}|nop)")
MAY_USE_STACK_POINTER = re.compile(r"(?:add|sub|mov|ldr|str|ldm|stm|push|pop|cmp)")
COMPARES = re.compile(r"(?:cmn|cmp|teq|tst|str|stm|push|b|bl|bx)")

# Functions of the device with a 64-bit or floating argument or result: the compiler and the device
# do not pass these alike.
WIDE_IMPORTS = re.compile(
    r"__(?:rt_[su](?:div|rem)64by64|[iu]64to[ds]|[ds]to[iu]64|(?:add|sub|mul|div|cmp|eq|ge|gt|le|lt|ne|neg)[ds]"
    r"|\w+to[ds])|_(?:abs64|rotl64|rotr64|byteswap_uint64|Count\w*64|atoi64|wtoi64|wtoll|fp\w+|finite|isnan|hypot|"
    r"j[01n]|y[01n]|copysign|chgsign|logb|nextafter|scalb|frnd\w*|fsqrt)|a?(?:sin|cos|tan)h?|atan2|floor|ceil|pow|"
    r"sqrt|f?mod[f]?|ldexp|frexp|fabs|exp|log(?:10)?|atof|strtod|wcstod|difftime")


def output(*command):
    done = subprocess.run([str(part) for part in command], capture_output=True, text=True, check=False)
    if done.returncode != 0:
        raise SystemExit(f"{pathlib.Path(command[0]).name}: {done.stderr.strip() or done.returncode}")
    return done.stdout


# ---- code ----

def instructions(disassembly):
    """(address, function, mnemonic, operands) of everything that is no data."""
    function = ""
    for line in disassembly.splitlines():
        start = re.match(r"[0-9a-f]+ <(.*)>:$", line)
        if start:
            function = start.group(1)
            continue
        parts = line.split("\t")
        if len(parts) < 2 or not re.match(r" *[0-9a-f]+: *$", parts[0]):
            continue
        mnemonic = parts[1].strip()
        operands = re.split(r"\s*[@;]", parts[2])[0].strip() if len(parts) > 2 else ""
        if not mnemonic.startswith("."):
            yield parts[0].strip(" :"), function, mnemonic, operands


def code_complaint(mnemonic, operands):
    """What is wrong with an instruction by itself, or None. A rounding begins with "rounds"."""
    if not KNOWN.fullmatch(mnemonic):
        return "is none of the instructions of version 4T that are used here"
    registers = operands.split(",")
    target = registers[0].strip(" !")
    if re.match(r"(?:ldm|pop)", mnemonic):
        if re.search(r"\bpc\b", operands[operands.find("{"):]):
            return "returns without BX"
    elif target == "pc" and not COMPARES.match(mnemonic):
        table = re.fullmatch(rf"ldr{CONDITION}", mnemonic) and re.fullmatch(
            r"pc, \[pc, \w+, lsl #2\]", operands)
        if not table:
            return "jumps without BX"
    if re.match(r"bics?" + CONDITION + "$", mnemonic) and re.search(r", #(?:7|15|31|63)$", operands):
        return "rounds to a multiple of 8"
    if re.search(r"\bsp\b", operands) and not MAY_USE_STACK_POINTER.match(mnemonic):
        return "takes the stack pointer for more than an address"
    return None


def stack_complaint(mnemonic, operands, on_stack):
    """The same for the bits of an address on the stack.

    @param on_stack  registers that hold one since an instruction or more; kept up to date
    """
    registers = [part.strip() for part in operands.split(",")]
    holds = re.match(r"(?:mov|add|sub)s?" + CONDITION + "$", mnemonic) and registers[1:2] == ["sp"]
    looks = re.match(r"(?:and|orr|bic|eor|tst|teq)", mnemonic) and on_stack & set(
        registers if mnemonic.startswith("t") else registers[1:])
    if not COMPARES.match(mnemonic) or re.match(r"bl", mnemonic):
        on_stack.difference_update(["r0", "r1", "r2", "r3"] if mnemonic.startswith("bl") else
                                   re.findall(r"\b(?:r\d+|fp|ip|lr)\b", operands)
                                   if re.match(r"ldm|pop", mnemonic) else registers[:1])
    if re.match(r"b(?!l|ic)", mnemonic):
        on_stack.clear()  # what follows is reached from elsewhere
    if holds and registers[0] != "sp":
        on_stack.add(registers[0])
    return "takes the bits of an address on the stack" if looks else None


def check_code(disassembly, reviewed, source_of):
    """@param reviewed   sources, or functions without one, whose roundings have been looked at
       @param source_of  gives the source that the instruction at an address comes from, or None
    """
    complaints, link_set, on_stack = [], None, set()
    for address, function, mnemonic, operands in instructions(disassembly):
        complaint = code_complaint(mnemonic, operands) or stack_complaint(mnemonic, operands, on_stack)
        if complaint and complaint.startswith("rounds"):
            source = source_of(address) or function.split(".")[0]
            complaint = None if source in reviewed else f"{complaint}, in {source}"
        if link_set is not None and mnemonic != "bx" + link_set:
            complaint = complaint or "does not call by BX, though the link register has been set"
        call = re.fullmatch(rf"mov({CONDITION})", mnemonic) if operands == "lr, pc" else None
        link_set = call.group(1) if call else None
        if complaint:
            complaints.append(f"{address} in {function}: {mnemonic} {operands}: {complaint}")
    return complaints


def source_in(elf):
    """The source_of() of an image: wherever the compiler has put the code, its source is the same."""
    def source_of(address):
        place = output("arm-none-eabi-addr2line", "-e", elf, address).split(":")[0]
        found = re.search(r"\b(?:src|platform|include)/.*", place)
        return found.group() if found else None
    return source_of


# ---- headers, imports, exports, relocations ----

HEADER = {
    "Machine": r"IMAGE_FILE_MACHINE_ARM \(0x1C0\)",
    "TimeDateStamp": r"1970-01-01 00:00:00 \(0x0\)",
    "OptionalHeaderSize": "224",
    "ImageBase": "0x10000000",
    "SectionAlignment": "4096",
    "FileAlignment": "512",
    "MajorSubsystemVersion": "5",
    "MinorSubsystemVersion": "0",
    "Subsystem": r"IMAGE_SUBSYSTEM_WINDOWS_CE_GUI \(0x9\)",
}


def check_header(readobj):
    complaints = []
    for name, value in HEADER.items():
        found = re.search(rf"^  {name}: (.*)$", readobj, re.M)
        if not found or not re.fullmatch(value, found.group(1)):
            complaints.append(f"the header's {name} is {found.group(1) if found else 'missing'}")
    if "Characteristics [ (0x210E)" not in readobj:
        complaints.append("the header's Characteristics are not 0x210e")
    return complaints


def listed_imports(text):
    """{library: {function}} of platform/ce/imports.txt"""
    found, library = {}, None
    for line in text.splitlines():
        line = line.strip()
        if line.startswith("["):
            library = line.strip("[]")
        elif line and not line.startswith("#"):
            found.setdefault(library, set()).add(line)
    return found


def check_imports(readobj, listed):
    complaints, found = [], {}
    for block in re.findall(r"^Import \{\n(.*?)^\}", readobj, re.M | re.S):
        library = re.search(r"^  Name: (.*)$", block, re.M).group(1)
        for function, hint in re.findall(r"^  Symbol: (\S*) \((\d+)\)$", block, re.M):
            found.setdefault(library, set()).add(function)
            if not function or hint != "0":
                complaints.append(f"imports {function or 'a number'} of {library} with hint {hint}")
    for library in sorted(found.keys() | listed.keys()):
        mine, theirs = found.get(library, set()), listed.get(library, set())
        complaints += [f"imports {name} of {library}, which imports.txt does not list" for name in sorted(mine - theirs)]
        complaints += [f"does not import {name} of {library}, which imports.txt lists" for name in sorted(theirs - mine)]
        complaints += [f"imports {name}, which takes or gives more than 32 bits"
                       for name in sorted(mine) if WIDE_IMPORTS.fullmatch(name)]
    return complaints


def check_exports(readobj, listed):
    found = re.findall(r"^Export \{\n  Ordinal: \d+\n  Name: (\S*)\n", readobj, re.M)
    complaints = [f"exports {name}, which exports.txt does not list" for name in sorted(set(found) - listed)]
    complaints += [f"does not export {name}, which exports.txt lists" for name in sorted(listed - set(found))]
    if found != sorted(found, key=str.encode) or len(found) != len(set(found)):
        complaints.append("the exports are not sorted, or one is there twice")
    return complaints


def check_import_library(readobj, listed):
    """@param readobj  what it says of the members of the import library"""
    found = re.findall(r"^Type: code\nName type: name\nSymbol: __imp_(\S+)\nSymbol: (\S+)$", readobj, re.M)
    offered = {slot for slot, function in found if slot == function}
    return [f"orvenix.lib and exports.txt differ in {name}" for name in sorted(offered ^ listed)]


def check_relocations(readobj, readelf):
    """The DLL has as many as the linker listed, all of them of one kind."""
    kinds = re.findall(r"^    Type: (\w+)$", readobj[readobj.index("BaseReloc ["):], re.M)
    words = 0
    for table in re.split(r"^Relocation section ", readelf, flags=re.M)[1:]:
        if re.match(r"'\.rel\.(?:text|rdata|data)'", table):
            words += len(re.findall(r"\bR_ARM_(?:ABS32|TARGET1)\b", table))
    complaints = [f"has relocations of kind {kind}" for kind in sorted(set(kinds) - {"HIGHLOW", "ABSOLUTE"})]
    if kinds.count("HIGHLOW") != words or words == 0:
        complaints.append(f"has {kinds.count('HIGHLOW')} relocations, where the linker listed {words}")
    return complaints


def check_same_code(linked, converted, moved):
    """The DLL's code is what was disassembled, but for the words that address import slots: each now
    addresses the entry of the same function.

    linked, converted: the bytes of both; moved: {address of a slot: address of the entry}
    """
    if len(linked) != len(converted):
        return ["its code has another length than the linker's"]
    complaints = []
    for at in range(0, len(linked), 4):
        before = int.from_bytes(linked[at:at + 4], "little")
        after = int.from_bytes(converted[at:at + 4], "little")
        if after != moved.get(before, before):
            complaints.append(f"its code has {after:08x} at {at:#x}, where the linker had {before:08x}")
    return complaints


def entries(readobj, base):
    """{function: address of its entry in an import address table}"""
    found = {}
    for block in re.findall(r"^Import \{\n(.*?)^\}", readobj, re.M | re.S):
        table = int(re.search(r"ImportAddressTableRVA: 0x([0-9A-F]+)", block).group(1), 16)
        for at, function in enumerate(re.findall(r"^  Symbol: (\S*) ", block, re.M)):
            found[function] = base + table + 4 * at
    return found


def code_of(elf, dll, readobj, readelf, symbols):
    """The arguments of check_same_code."""
    _, offset, size = next((int(address, 16), int(offset, 16), int(size, 16)) for name, address, offset, size in
                           re.findall(r"^ *\[ *\d+\] (\S+) +\S+ +([0-9a-f]+) ([0-9a-f]+) ([0-9a-f]+)", readelf, re.M)
                           if name == ".text")
    raw = int(re.search(r"Name: \.text .*?PointerToRawData: 0x([0-9A-F]+)", readobj, re.S).group(1), 16)
    base = int(re.search(r"ImageBase: 0x([0-9A-F]+)", readobj).group(1), 16)
    table = entries(readobj, base)
    moved = {int(address, 16): table[function]
             for address, function in re.findall(r"^([0-9a-f]+) \w __imp_(\S+)$", symbols, re.M)}
    return elf.read_bytes()[offset:offset + size], dll.read_bytes()[raw:raw + size], moved


# What would end the host's process, or count on the end of one.
UNWANTED = {"_Znwj": "operator new that ends the process", "_Znaj": "operator new[] that ends the process",
            "abort": "abort", "__aeabi_atexit": "a static destructor"}


def check_symbols(symbols):
    there = set(re.findall(r"^[0-9a-f]+ \w (\S+)$", symbols, re.M))
    return [f"has {what}" for name, what in UNWANTED.items() if name in there]


# ---- declarations ----

NARROW = re.compile(r"(?:const )?(?:BYTE|UCHAR|CHAR|char|bool|WORD|USHORT|SHORT|ATOM|WCHAR|(?:unsigned )?short|"
                    r"(?:std::)?u?int(?:8|16)_t)")
WIDE = re.compile(r"(?:const )?(?:LONGLONG|ULONGLONG|double|float|ULARGE_INTEGER|(?:std::)?u?int64_t)")
FUNCTION = re.compile(r"^(?:ORVENIX_EXPORT )?([A-Za-z_][\w: ]*?[ *&]+)(\w+)\(([^()]*)\)(?: ICFG_NOEXCEPT)?;", re.M)


def without_name(parameter):
    return re.sub(r"\s*\b\w+$", "", parameter.strip()) if " " in parameter.strip() else parameter.strip()


def check_declarations(api, cleared, may_take_narrow):
    """@param cleared  functions whose results of 8 or 16 bits the veneers clear
       @param may_take_narrow  we are the caller, and extend what is passed"""
    structures = set(re.findall(r"^struct (\w+) \{", api, re.M))
    complaints = []
    for result, name, parameters in FUNCTION.findall(re.sub(r"//.*|/\*.*?\*/", "", api)):
        result = result.strip()
        name = name.removeprefix("ce_")
        if NARROW.fullmatch(result) and name not in cleared:
            complaints.append(f"{name} gives {result}, and nobody clears the rest of the register")
        if WIDE.fullmatch(result) or result in structures:
            complaints.append(f"{name} gives {result}, which is more than a register")
        for parameter in (without_name(part) for part in parameters.split(",")):
            if WIDE.fullmatch(parameter) or NARROW.fullmatch(parameter) and not may_take_narrow:
                complaints.append(f"{name} takes {parameter}, which is no word")
    return complaints


# ---- variadic calls ----

WIDE_CONVERSION = re.compile(r"%[-+ #0-9.*]*(?:(?:ll|j|z|t|L|q|I64|w)\s*[a-zA-Z]|[aefgAEFG])")
# `...` behind a comma or alone, and not behind a type: no parameter pack.
VARIADIC = re.compile(r"[(,]\s*\.\.\.\s*\)\s*(?:const\s*)?(?:noexcept\s*)?(?:override\s*)?(?:final\s*)?[;{]")
LITERAL = re.compile(r'"((?:[^"\\\n]|\\.)*)"')


def declared(head):
    """The name in front of the last parenthesis that `head` leaves open, or None."""
    depth = 0
    for at in range(len(head) - 1, -1, -1):
        depth += {")": 1, "(": -1}.get(head[at], 0)
        if depth < 0:
            name = re.search(r"(\w+)\s*$", head[:at])
            return name.group(1) if name else None
    return None


def check_formats(sources):
    """@param sources  {path: text} of everything that is compiled into the library"""
    complaints, formatted, variadic = [], set(), {}
    for path, text in sources.items():
        joined = re.sub(r'(?<!\\)"\s*"', "", text.replace("'\"'", "").replace('""', ""))
        if re.search(r"\bPRI[diouxX](?:64|MAX)\b", text):
            complaints.append(f"{path}: has a conversion of 64 bits by its name")
        for literal in LITERAL.findall(joined):
            bad = WIDE_CONVERSION.search(literal.replace("%%", ""))
            if bad:
                complaints.append(f'{path}: {bad.group()} in "{literal}" is a conversion of more than 32 bits')
        for declaration in VARIADIC.finditer(text):
            begin = max(text.rfind(mark, 0, declaration.start()) for mark in ";{}")
            head = text[begin + 1:declaration.start() + 1]
            name = declared(head)
            if name is None:
                continue  # operands of an operator
            variadic.setdefault(name, f"{path}:{text.count(chr(10), 0, declaration.start()) + 1}")
            if "gnu::format" in head:
                formatted.add(name)
    complaints += [f"{place}: {name} is variadic, and its format is compared with nothing"
                   for name, place in sorted(variadic.items()) if name not in formatted]
    return complaints


def check_flags(commands):
    """Everything of the library is compiled with formats compared."""
    return [f"{entry['file']} is compiled without -Wformat=2 -Werror" for entry in commands
            if "/src/" in entry["file"]
            and not {"-Wformat=2", "-Werror"} <= set(shlex.split(entry["command"]))]


# Variadic functions of the device that the library may call, all with wide formats.
DEVICE_VARIADIC = {"NKDbgPrintfW"}
TYPE_CHECK = """
#include <coredll.h>
#include <type_traits>
template <typename... Arguments>
constexpr int HaveWordsOnly() {
  static_assert(((sizeof(Arguments) <= 4 && !std::is_floating_point_v<Arguments>) && ...),
                "an argument of more than 32 bits in a variadic call");
  return 0;
}
template <typename... Arguments>
int HaveWordsOnly(Arguments...) { return HaveWordsOnly<Arguments...>(); }
#define NKDbgPrintfW(...) (static_cast<void>(HaveWordsOnly(__VA_ARGS__)), NKDbgPrintfW(__VA_ARGS__))
"""


def device_variadic(api):
    """Names of the device's variadic functions, out of its declarations."""
    return set(re.findall(r"\b(\w+)\s*\([^();]*,\s*\.\.\.\s*\)", api))


def check_wide_calls(command, source):
    """Compiles calls to the device's variadic functions with a look at the types of their arguments."""
    with tempfile.TemporaryDirectory() as folder:
        header = pathlib.Path(folder, "types.h")
        header.write_text(TYPE_CHECK)
        words = shlex.split(command)
        while pathlib.Path(words[0]).name in ("cmake", "-E", "env", "ccache") or "=" in words[0] or words[0] == "-E":
            words = words[1:]
        kept = [word for i, word in enumerate(words) if word not in ("-o", "-c") and words[i - 1] not in ("-o", "-c")]
        done = subprocess.run(kept + ["-include", str(header), "-fsyntax-only", str(source)],
                              capture_output=True, text=True, check=False)
    if done.returncode == 0:
        return []
    errors = [line for line in done.stderr.splitlines() if "error:" in line]
    return [f"{source}: {(errors or ['cannot be compiled'])[0]}"]


def check_sources(commands):
    sources = {str(path.relative_to(ROOT)): path.read_text() for folder in ("src", "include", "platform/ce")
               for path in sorted((ROOT / folder).rglob("*"))
               if path.suffix in (".h", ".cpp") and "loader" not in path.parts}
    complaints = check_formats(sources) + check_flags(commands)
    api = "".join(path.read_text() for path in sorted((ROOT / "platform/api/ce").glob("*.h")))
    complaints += [f"platform/api/ce: {name} is variadic, and nothing here looks at its arguments"
                   for name in sorted(device_variadic(api) - DEVICE_VARIADIC)]
    for entry in commands:
        path = pathlib.Path(entry["file"])
        if path.is_file() and any(name in path.read_text() for name in DEVICE_VARIADIC):
            complaints += check_wide_calls(entry["command"], path)
    return complaints


# ---- the files as a whole ----

def check_reproducible(build):
    """The converter, run again, writes the same bytes; the second link made the same code before."""
    version = re.search(r"project\(Orvenix VERSION (\S+)", (ROOT / "CMakeLists.txt").read_text())[1]
    rules = (ROOT / "platform/ce/CMakeLists.txt").read_text()
    description = re.search(r'--description "(.*)"', rules)[1]
    with tempfile.TemporaryDirectory() as folder:
        again = pathlib.Path(folder, "orvenix.dll")
        said = output(build / "elf2pe", build / "orvenix.elf", again, "--name", "orvenix.dll", "--exports",
                      ROOT / "platform/ce/exports.txt", "--check", build / "orvenix_check.elf",
                      "--version", version, "--description", description)
        if "confirmed by second link" not in said:
            return ["the relocations are not confirmed by a second link"]
        if again.read_bytes() != (build / "orvenix.dll").read_bytes():
            return ["converted again, it has other bytes"]
    return []


def names(path):
    return {line.split("#")[0].strip() for line in path.read_text().splitlines()} - {""}


def main():
    if len(sys.argv) > 2 or sys.argv[1:2] in (["-h"], ["--help"]):
        sys.exit(__doc__.strip())
    build = pathlib.Path(sys.argv[1] if len(sys.argv) == 2 else ROOT / "build/ce").resolve()
    dll, elf = build / "orvenix.dll", build / "orvenix.elf"
    library = build / "orvenix.lib"
    for needed in (dll, elf, library, build / "orvenix_check.elf", build / "elf2pe", build / "compile_commands.json"):
        if not needed.exists():
            sys.exit(f"{needed}: is not there; build the library for the device first")
    readobj = shutil.which("llvm-readobj-14") or "llvm-readobj"
    seen = output(readobj, "--file-headers", "--sections", "--coff-imports", "--coff-exports", "--coff-basereloc", dll)
    platform = ROOT / "platform/ce"
    complaints = check_code(output("arm-none-eabi-objdump", "-d", "--no-show-raw-insn", elf),
                            names(platform / "reviewed_code.txt"), source_in(elf))
    symbols = output("arm-none-eabi-nm", elf)
    complaints += check_same_code(*code_of(elf, dll, seen, output("arm-none-eabi-readelf", "-SW", elf), symbols))
    complaints += check_symbols(symbols)
    for folder, narrow in ((ROOT / "platform/api/ce", True), (ROOT / "include/orvenix", False)):
        api = "".join(path.read_text() for path in sorted(folder.glob("*.h")) if path.name != "upgrade_config.h")
        complaints += check_declarations(api, import_veneers.SHORT_RESULTS, narrow)
    complaints += check_header(seen)
    complaints += check_imports(seen, listed_imports((platform / "imports.txt").read_text()))
    complaints += check_exports(seen, names(platform / "exports.txt"))
    complaints += check_import_library(output(readobj, library), names(platform / "exports.txt"))
    complaints += check_relocations(seen, output("arm-none-eabi-readelf", "-rW", elf))
    complaints += check_sources(json.loads((build / "compile_commands.json").read_text()))
    complaints += check_reproducible(build)
    size = dll.stat().st_size
    if size > LARGEST_DLL:
        complaints.append(f"has {size} bytes, more than {LARGEST_DLL}")
    print("\n".join(f"{dll.name}: {complaint}" for complaint in complaints) if complaints else
          f"{dll.name}: {size} bytes, code, headers, imports, exports and relocations as they must be")
    return 1 if complaints else 0


if __name__ == "__main__":
    sys.exit(main())
