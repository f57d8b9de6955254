#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Compares the includes of the sources with the table of folders in docs/architecture.md.

Usage: includes_test.py CHECKOUT

Fails for a source file whose folder has no row, for an include that its row does not allow, and for an arrow
of the table that no include needs any more. In the last column, names in backticks are folders and headers of
the project, the others the libraries below. The standard library and the system's headers are open to all.
"""
import pathlib
import re
import sys

# The first part of a library's includes, and its name in the table.
LIBRARIES = {
    'CLI': 'CLI11', 'cppmicroservices': 'CppMicroServices', 'expat.h': 'expat', 'libdeflate.h': 'libdeflate',
    'microhttpd.h': 'libmicrohttpd', 'nats': 'libnats', 'openssl': 'OpenSSL', 'simdjson.h': 'simdjson',
    'spdlog': 'spdlog', 'unicode': 'ICU',
}
# What the system has: folders, and single headers. Those of C++ have no ending.
SYSTEM = {
    'sys', 'linux', 'netinet', 'arm_neon.h', 'dirent.h', 'dlfcn.h', 'emmintrin.h', 'fcntl.h', 'immintrin.h',
    'limits.h', 'locale.h', 'malloc.h', 'netdb.h', 'poll.h', 'pthread.h', 'signal.h', 'stdlib.h', 'unistd.h',
}
UNRESTRICTED = ('tests/', 'benchmarks/', 'fuzz/', 'examples/')
INCLUDE = re.compile(r'^\s*#\s*include\s+([<"])([^>"]+)[>"]', re.MULTILINE)


def rows(page):
    """What each folder of the table may include: {folder: set of names}."""
    table = page.split('| folder |', 1)[1].split('\n\n', 1)[0]
    allowed = {}
    for line in table.splitlines()[2:]:
        folders, _, names = (cell.strip() for cell in line.strip('|').split('|'))
        own = set(re.findall(r'`([^`]+)`', names))
        others = {name.strip() for name in re.sub(r'`[^`]+`', '', names).split(',')} - {''}
        for folder in re.findall(r'`([^`]+)`', folders):
            allowed[folder] = own | others
    return allowed


def arrow(names, kind, header):
    """The name that has to stand in the table for the include, or None where none has to."""
    first = header.split('/')[0]
    if kind == '"':
        return max((name for name in names if header.startswith(name)), key=len, default=header)
    if first in LIBRARIES:
        return LIBRARIES[first]
    is_open_to_all = first in SYSTEM or (first == header and '.' not in header)
    return None if is_open_to_all else header


def main(root):
    allowed = rows((root / 'docs/architecture.md').read_text())
    unused = {(folder, name) for folder, names in allowed.items() for name in names}
    faults = []
    sources = sorted(path for pattern in ('*.h', '*.cpp', '*.cpp.in') for path in root.rglob(pattern))
    for path in sources:
        file = path.relative_to(root).as_posix()
        if file.startswith(UNRESTRICTED + ('build/', '.git/')) or '/node_modules/' in file:
            continue
        folder = max((name for name in allowed if file.startswith(name)), key=len, default=None)
        if folder is None:
            faults.append(f'{file}: no row of the table has its folder')
            continue
        for kind, header in INCLUDE.findall(path.read_text()):
            if kind == '"' and max((name for name in allowed if header.startswith(name)), key=len,
                                   default=None) == folder:
                continue
            name = arrow(allowed[folder], kind, header)
            unused.discard((folder, name))
            if name is not None and name not in allowed[folder]:
                faults.append(f'{file}: {folder} may not include {header}')
    faults += [f'{folder}: nothing there includes {name}' for folder, name in sorted(unused)]
    print('\n'.join(faults) or f'{len(sources)} files keep to the table')
    return bool(faults)


if __name__ == '__main__':
    sys.exit(main(pathlib.Path(sys.argv[1])))
