#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Fails when a C++ file of the tree is not as clang-format writes it."""
import pathlib
import shutil
import subprocess
import sys

root = pathlib.Path(sys.argv[1])
if not shutil.which("clang-format"):
    print("skipped: clang-format is not installed")
    sys.exit(77)
files = sorted(str(path) for top in ("Helper", "Client", "Tools", "Tests", "Benchmarks", "Fuzz")
               for path in (root / top).rglob("*") if path.suffix in (".h", ".cpp", ".c"))
result = subprocess.run(["clang-format", "--dry-run", "-Werror", *files], check=False)
print(f"{len(files)} files read")
sys.exit(result.returncode or (0 if files else 1))
