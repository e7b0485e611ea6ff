#!/usr/bin/python3
"""An installed tree, as a machine would have it.

The tree is made by `cmake --install --strip` of a build folder into a scratch
DESTDIR (--install-build), or given already made (--root, as the package test
does after unpacking the .debs). Then:
1. every installed ELF file is read: its RPATH/RUNPATH holds only $ORIGIN
   relative entries and no byte of it names the build folder; the plug-in is
   there with its SONAME link and without a development link or headers;
2. in a private mount namespace, each top-level folder of the tree is laid
   read-only over the machine's own (the machine's files are untouched), the
   installed ws-runtime is started with no flags and no environment that
   points anywhere, and over HTTP the listing must succeed and an unknown
   device's error answer must carry the shipped explanation text: the
   installed marker /etc/korvane/share/share.dir led the installed plug-in
   to the installed texts;
3. the installed service unit is checked by `systemd-analyze verify` in the
   same namespace, when the machine has systemd-analyze;
4. the build folder installed again with `--prefix` another prefix: the
   marker and the unit name that prefix, not the configured one.

Needs root (a mount namespace); exits 77, which CTest reports as skipped,
with the reason when it cannot have one."""

import argparse
import json
import os
import re
import shutil
import subprocess
import sys
import tempfile

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "support"))
from quillon_host import Host, environment  # noqa: E402

SKIP = 77
DEVICE = "/quillon/syncableDevices/pendulo/timekeeper/genericTk"
PLATFORM_LIBRARIES = ("libws_runtime.so.13", "libkopdm_clientapi.so.1", "libkosdlib.so.1",
                      "libkopenduloSdPlugin.so.1", "libkosslinit.so.13", "libcurlimpl.so.13")


def installed_files(root):
    for folder, _, files in os.walk(root):
        for name in files:
            yield os.path.join(folder, name)


def elf_problems(root, build_tree):
    problems, checked = [], 0
    needle = build_tree.encode()
    for path in installed_files(root):
        if os.path.islink(path):
            continue
        with open(path, "rb") as file:
            content = file.read()
        if not content.startswith(b"\x7fELF"):
            continue
        checked += 1
        shown = os.path.relpath(path, root)
        if needle in content:
            problems.append(f"{shown} names the build tree {build_tree}")
        dynamic = subprocess.run(["readelf", "-d", path], capture_output=True, text=True, check=True).stdout
        for kind, paths in re.findall(r"\((RPATH|RUNPATH)\)\s+Library \w+: \[(.*)\]", dynamic):
            for entry in paths.split(":"):
                if not entry.startswith("$ORIGIN"):
                    problems.append(f"{shown}: {kind} entry {entry} is not relative to $ORIGIN")
    if checked == 0:
        problems.append("no ELF file was installed")
    return problems


def layout_problems(root, bindir):
    problems = []
    names = {os.path.basename(p): p for p in installed_files(root)}
    for soname in ("libquillon.so.1",) + PLATFORM_LIBRARIES:
        if soname not in names:
            problems.append(f"{soname} is not installed")
    if not os.access(os.path.join(root, bindir.lstrip("/"), "ws-runtime"), os.X_OK):
        problems.append(f"{bindir}/ws-runtime is not installed")
    for development in ("libquillon.so", "quillon.h"):
        if development in names:
            problems.append(f"development file {os.path.relpath(names[development], root)} is installed")
    if not os.path.isfile(os.path.join(root, "etc/korvane/share/share.dir")):
        problems.append("the marker /etc/korvane/share/share.dir is not installed")
    return problems


def namespace_prefix(root):
    """The command prefix that runs a program with `root`'s top-level folders
    laid read-only over the machine's in a private mount namespace."""
    mounts = []
    for top in sorted(os.listdir(root)):
        lower = os.path.join(root, top)
        if os.path.isdir(lower) and not os.path.islink(lower) and os.path.isdir("/" + top):
            mounts.append(f"mount -t overlay overlay -o ro,lowerdir={lower}:/{top} /{top}")
    script = "set -e; " + "; ".join(mounts) + '; exec "$@"'
    return ["unshare", "--mount", "--propagation", "private", "sh", "-c", script, "sh"]


def explanation(path, code):
    """The shipped explanation of `code`, as the service gives it."""
    with open(path, encoding="utf-8") as file:
        text = file.read()
    match = re.search(r'^<koerror code="%d">\n(.*?)\n</koerror>' % code, text, re.S | re.M)
    if not match:
        raise ValueError(f"{path} does not explain {code}")
    return match.group(1).rstrip("\r\n")


def service_problems(root, bindir, explanations):
    problems = []
    env = environment(KOSYSQ_SHARE_DIR_FILE=None, KOPDM_SIM_SCENARIO=None, LD_LIBRARY_PATH=None)
    with Host(os.path.join(bindir, "ws-runtime"), env=env, prefix=namespace_prefix(root)) as host:
        listing = host.request("GET", "/quillon/resources")
        if listing.status != 200 or b'"success":true' not in listing.body:
            problems.append(f"the listing failed: {listing.status} {listing.body[:300]!r}")
        wrong = host.request("GET", DEVICE + "X")
        try:
            text = json.loads(wrong.body)["error"]["errorText"]
        except (ValueError, KeyError, TypeError):
            text = None
        expected = explanation(explanations, -52006)
        if wrong.status != 500 or wrong.header("X-Status-Code") != "-52006" or text != expected:
            problems.append(f"the error answer lacks the installed explanation {expected!r}: "
                            f"{wrong.status} {wrong.body[:300]!r}")
        else:
            print(f"error answer over HTTP carries the installed text: {text!r}")
        code = host.stop()
        if code != 0:
            problems.append(f"the installed ws-runtime stopped with {code}:\n{host.log()}")
    return problems


def unit_problems(root, unit):
    if shutil.which("systemd-analyze") is None:
        print("NOTE: systemd-analyze is not installed: the service unit was not verified")
        return []
    if not os.path.isfile(os.path.join(root, unit.lstrip("/"))):
        return [f"the service unit {unit} is not installed"]
    verify = subprocess.run(namespace_prefix(root) + ["systemd-analyze", "verify", unit],
                            capture_output=True, text=True)
    if verify.returncode != 0 or verify.stdout.strip() or verify.stderr.strip():
        return [f"systemd-analyze verify {unit}: {verify.returncode}\n{verify.stdout}{verify.stderr}"]
    print(f"systemd-analyze verify {unit}: clean")
    return []


def prefix_problems(build):
    """Installs `build` with a prefix it was not configured for."""
    prefix = "/opt/quillon-elsewhere"
    expected = {"etc/korvane/share/share.dir": prefix + "/share/korvane\n",
                prefix[1:] + "/lib/systemd/system/ws-runtime.service": f"ExecStart={prefix}/bin/ws-runtime "}
    with tempfile.TemporaryDirectory(prefix="quillon-prefix-") as root:
        install = subprocess.run(["cmake", "--install", build, "--prefix", prefix],
                                 env=environment(DESTDIR=root), capture_output=True, text=True)
        if install.returncode != 0:
            return [f"cmake --install --prefix {prefix} failed:\n{install.stdout}{install.stderr}"]
        texts = {path: open(os.path.join(root, path), encoding="utf-8").read() for path in expected}
    return [f"installed with --prefix {prefix}, /{path} lacks {part!r}:\n{texts[path]}"
            for path, part in expected.items() if part not in texts[path]]


def main():
    parser = argparse.ArgumentParser()
    source = parser.add_mutually_exclusive_group(required=True)
    source.add_argument("--install-build", help="build folder to `cmake --install` into a scratch root")
    source.add_argument("--root", help="an installed root to check as it is")
    parser.add_argument("--build-tree", required=True, help="no installed file may name this folder")
    parser.add_argument("--bindir", required=True, help="where the host is installed, e.g. /usr/bin")
    parser.add_argument("--unit", required=True, help="where the service unit is installed")
    parser.add_argument("--explanations", required=True, help="the shipped English explanation file")
    arguments = parser.parse_args()

    problems = prefix_problems(arguments.install_build) if arguments.install_build else []
    if problems:
        print("\n".join(problems))
        return 1
    if os.geteuid() != 0:
        print("SKIP: needs root for a private mount namespace, so that the installed marker under "
              "/etc/korvane is the one read without changing this machine's /etc")
        return SKIP
    probe = subprocess.run(["unshare", "--mount", "true"], capture_output=True, text=True)
    if probe.returncode != 0:
        print(f"SKIP: no private mount namespace here: {probe.stderr.strip()}")
        return SKIP

    scratch = None
    root = arguments.root
    if root is None:
        scratch = tempfile.mkdtemp(prefix="quillon-install-")
        root = os.path.join(scratch, "root")
        install = subprocess.run(["cmake", "--install", arguments.install_build, "--strip"],
                                 env=environment(DESTDIR=root), capture_output=True, text=True)
        if install.returncode != 0:
            print(install.stdout + install.stderr)
            return 1
    try:
        files = sorted(os.path.relpath(p, root) for p in installed_files(root))
        print(f"{len(files)} files installed under {root}")
        problems = layout_problems(root, arguments.bindir)
        problems += elf_problems(root, os.path.realpath(arguments.build_tree))
        if not problems:
            problems += service_problems(root, arguments.bindir, arguments.explanations)
            problems += unit_problems(root, arguments.unit)
    finally:
        if scratch:
            shutil.rmtree(scratch, ignore_errors=True)
    print("\n".join(problems) if problems else "the installed tree serves as it should")
    return 1 if problems else 0


if __name__ == "__main__":
    sys.exit(main())
