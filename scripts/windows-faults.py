#!/usr/bin/env python3
"""Puts one-line faults into platform/windows, one at a time, and prints which tests see each.

    scripts/windows-faults.py [BUILD] [FIRST [LAST]]

BUILD is a folder in which everything is built, file by file:

    cmake --preset windows-x64 -B build/faults -DCMAKE_UNITY_BUILD=OFF && cmake --build build/faults

Only the changed file is compiled, and the two modules and the test program that contains it are linked, in a folder of
their own: neither the sources nor the build change. The tests over a PC in the system's own ABI are asked first, and the
other Windows tests only about what those miss. Ends with 1 when fewer are seen than the project wants.
"""
import json, os, pathlib, re, shlex, shutil, signal, subprocess, sys, tempfile

ROOT = pathlib.Path(__file__).resolve().parent.parent
BUILD = pathlib.Path(sys.argv[1] if len(sys.argv) > 1 else ROOT / "build/faults").resolve()

# File, what stands there, what is put there.
FAULTS = [
    ("device_io", "access, share, nullptr", "share, access, nullptr"),
    ("device_io", "OPEN_EXISTING", "OPEN_ALWAYS"),
    ("device_io", "outBytes, Native(&ret", "outBytes - 1, Native(&ret"),
    ("device_io", "const_cast<void*>(in), inBytes", "const_cast<void*>(in), inBytes / 2"),
    ("device_io", "const_cast<void*>(in)", "out"),
    ("device_io", "CloseHandle(Native(handle))", "handle != 0"),
    ("device_manager", "CM_Get_Parent(answer", "CM_Get_Child(answer"),
    ("device_manager", "Native(buffer), bufferChars", "Native(buffer), bufferChars * 2"),
    ("device_manager", "if (status) node", "node"),
    ("device_manager", "node, property,", "node, property - 1,"),
    ("device_manager", "CM_Get_Sibling(answer, node, 0)", "CM_Get_Sibling(answer, node, 1)"),
    ("device_sets", "nullptr, nullptr, flags", "nullptr, nullptr, flags & ~2u"),
    ("device_sets", "nullptr, nullptr, flags", "nullptr, nullptr, flags & ~16u"),
    ("device_sets", "&interfaceClass), index,", "&interfaceClass), index + 1,"),
    ("device_sets", "detailBytes, Native(", "detailBytes / 2, Native("),
    ("device_sets", "NativeElement(device)", "nullptr"),
    ("device_sets", "bufferChars, Native(required)));\n}\n\nStatus WindowsHost::GetDeviceReg",
     "bufferChars / 2, Native(required)));\n}\n\nStatus WindowsHost::GetDeviceReg"),
    ("device_sets", "bufferBytes, Native(req", "bufferBytes / 2, Native(req"),
    ("device_sets", "Native(type), static_cast<BYTE*>", "nullptr, static_cast<BYTE*>"),
    ("device_sets", "SetupDiDestroyDeviceInfoList(Native(set))", "set != 0"),
    ("device_sets", "sizeof *images", "sizeof images->cbSize"),
    ("device_sets", "SetupDiDestroyClassImageList(images.get())", "images != nullptr"),
    ("volumes", "FindVolumeClose(Native(search))", "search != 0"),
    ("volumes", "FindFirstVolumeW(Native(name), nameChars)", "FindFirstVolumeW(Native(name), nameChars / 8)"),
    ("volumes", "Native(names), namesChars", "Native(names), namesChars * 2"),
    ("volumes", "Native(&fileSystemFlags)", "Native(&serial)"),
    ("volumes", "FindVolumeMountPointClose", "FindVolumeClose"),
    ("volumes", "GetDriveTypeW(Native(path))", "GetDriveTypeW(Native(path) + 1)"),
    ("volumes", "QueryDosDeviceW(Native(name), Native(target), targetChars) != 0",
     "QueryDosDeviceW(Native(name), Native(target), targetChars) == 0"),
    ("desktop", "const_cast<void*>(filter), flags", "const_cast<void*>(filter), 0"),
]
WANTED_BY_ALL, WANTED_BY_THE_PC = 29, 26

# Program, arguments and what is added to the environment: the cheapest first, and nothing after the first that fails.
PC = [("zkusb_abi_pc_tests", ["--gtest_fail_fast", "--gtest_filter=" + tests], environment) for tests, environment in [
    ("*MadeUp*:*OlderWay*", {"ZKUSB_PCS": "24"}),
    ("*EveryStart*", {"ZKUSB_STARTS": "1"}),
    ("*MayFail*", {}),
    ("*MadeUp*:*PulledOut*", {"ZKUSB_RANDOM_SEED": "25"}),
    ("*Client*", {}),
]]
OTHERS = [("zkusb_windows_tests", [], {}), ("zkusb_windows_module_tests", ["--gtest_filter=-Console*"], {})]
MOST_SECONDS = 300


def run(command, **options):
    return subprocess.run(command, shell=isinstance(command, str), capture_output=True, text=True, errors="replace",
                          **options)


def link_command(target):
    return run(["ninja", "-t", "commands", target], cwd=BUILD).stdout.splitlines()[-1]


def build(folder, source, before, after):
    """The platform library with the fault; the rest is what stands in the build."""
    path = ROOT / "platform/windows" / (source + ".cpp")
    text = path.read_text()
    assert text.count(before) >= 1, (source, before)
    changed = folder / (source + ".cpp")
    changed.write_text(text.replace(before, after, 1))
    entry = next(e for e in json.load(open(BUILD / "compile_commands.json")) if e["file"] == str(path))
    compiled = folder / (source + ".cpp.obj")
    words = shlex.split(entry["command"])
    words = [str(compiled) if w.endswith(source + ".cpp.obj") else str(changed) if w == str(path) else w for w in words]
    made = run([w for w in words if not w.startswith("-W")], cwd=BUILD)
    assert made.returncode == 0, made.stderr
    library = folder / "libzkusb_platform.a"
    shutil.copy(BUILD / "platform/libzkusb_platform.a", library)
    assert run(["x86_64-w64-mingw32-ar", "r", str(library), str(compiled)]).returncode == 0
    (folder / "bin").mkdir()
    for file in list(BUILD.glob("*.exe")) + list(BUILD.glob("*.dll")) + list((BUILD / "bin").glob("zkusb_*")):
        os.symlink(file, folder / file.relative_to(BUILD))


def link(folder, targets):
    """Those targets with the fault."""
    for target in targets:
        out = folder / target
        out.unlink(missing_ok=True)
        command = link_command(target).replace("platform/libzkusb_platform.a", str(folder / "libzkusb_platform.a"))
        command = command.replace(f"-o {target}", f"-o {out}")
        command = re.sub(r"--out-implib,[^ ,]*", f"--out-implib,{folder}/imports.a", command)
        made = run(re.sub(r"-Map=[^ ]*", f"-Map={folder}/symbols.map", command), cwd=BUILD)
        assert made.returncode == 0, made.stderr


def sees(folder, program, arguments, environment):
    """The first thing that the program says about a failure; None where it passes."""
    program = subprocess.Popen([ROOT / "scripts/windows-run.sh", folder / "bin" / (program + ".exe"), *arguments],
                               env={**os.environ, **environment}, stdout=subprocess.PIPE, stderr=subprocess.DEVNULL,
                               text=True, errors="replace", start_new_session=True)
    try:
        output = program.communicate(timeout=MOST_SECONDS)[0]
    except subprocess.TimeoutExpired:
        os.killpg(program.pid, signal.SIGKILL)
        return f"{arguments[-1:]} hangs"
    if program.returncode == 0 and "  PASSED  " in output:
        return None
    failed = [line.split("] ")[1].split(" (")[0] for line in output.splitlines() if line.startswith("[  FAILED  ]")]
    return failed[0].split(",")[0] if failed else f"{arguments[-1:]} crashes"


def first_that_sees(folder, tests):
    return next((seen for test in tests if (seen := sees(folder, *test))), None)


def main():
    first = int(sys.argv[2]) if len(sys.argv) > 2 else 1
    last = int(sys.argv[3]) if len(sys.argv) > 3 else len(FAULTS)
    if first == 1:
        alarm = first_that_sees(BUILD, PC + OTHERS)
        assert alarm is None, f"without a fault: {alarm}"
    by_pc = by_all = 0
    for number, (source, before, after) in enumerate(FAULTS, 1):
        if not first <= number <= last:
            continue
        folder = pathlib.Path(tempfile.mkdtemp(prefix="windows-fault-"))
        try:
            build(folder, source, before, after)
            link(folder, ["ZKUsbMonitor.dll"])
            pc = others = first_that_sees(folder, PC)
            if not pc:
                link(folder, ["ZKUsbMonitorSimulated.dll", "bin/zkusb_windows_tests.exe"])
                others = first_that_sees(folder, OTHERS)
        finally:
            shutil.rmtree(folder)
        by_pc += bool(pc)
        by_all += bool(others)
        print(f"{number:2} {source}: {before.splitlines()[0]} -> {after.splitlines()[0]} | {others or '-'} | "
              f"{'the PC' if pc else 'others' if others else 'nobody'}", flush=True)
    count = last - first + 1
    print(f"{count} faults: {by_pc} seen by the PC in the system's ABI, {by_all} by all")
    missing = len(FAULTS) - count
    return 0 if by_all + missing >= WANTED_BY_ALL and by_pc + missing >= WANTED_BY_THE_PC else 1


if __name__ == "__main__":
    sys.exit(main())
