# SPDX-License-Identifier: Apache-2.0
"""Which files of the tree the checks look at."""

import os
import pathlib

FOREIGN_FOLDERS = {"build", "out", ".git", ".cache"}


def all_files(root):
    """Every file below root that people write, as paths relative to root, sorted."""
    found = []
    for folder, subfolders, names in os.walk(root):
        subfolders[:] = [name for name in subfolders if name not in FOREIGN_FOLDERS]
        found += [pathlib.Path(folder, name).relative_to(root) for name in names]
    return sorted(found)


def cpp_files(root):
    return [path for path in all_files(root) if path.suffix in {".h", ".cpp"}]
