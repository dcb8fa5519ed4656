"""The frozen copies of an AIDL package and their interface hash.

A frozen version is a directory holding every .aidl file of the package,
each with the notice below on top. Its hash is the one the platform's build
computes: sha1 over the `sha1sum` lines of the .aidl files (relative paths,
sorted bytewise) followed by the line "latest-version".
"""

import hashlib
import os
from typing import List, Tuple

# The notice that the platform's tools put on top of every frozen file.
FROZEN_HEADER = '''\
///////////////////////////////////////////////////////////////////////////////
// THIS FILE IS IMMUTABLE. DO NOT EDIT IN ANY CASE.                          //
///////////////////////////////////////////////////////////////////////////////

// This file is a snapshot of an AIDL file. Do not edit it manually. There are
// two cases:
// 1). this is a frozen version file - do not edit this in any case.
// 2). this is a 'current' file. If you make a backwards compatible change to
//     the interface (from the latest frozen version), the build system will
//     prompt you to update this file with `m <name>-update-api`.
//
// You must not make a backward incompatible change to any AIDL file built
// with the aidl_interface module type with versions property set. The module
// type is used to build AIDL files in a way that they can be used across
// independently updatable components of the system. If a device is shipped
// with such a backward incompatible change, it has a high risk of breaking
// later when a module using the interface is updated, e.g., Mainline modules.

'''


def aidl_files(root: str) -> List[str]:
    """Paths of the .aidl files under |root|, relative to it, sorted bytewise."""
    found = []
    for directory, subdirectories, names in os.walk(root):
        # A source tree keeps its frozen copies beside it; they are not sources.
        subdirectories[:] = sorted(d for d in subdirectories if d != 'aidl_api')
        for name in names:
            if name.endswith('.aidl'):
                found.append(os.path.relpath(os.path.join(directory, name), root))
    return sorted(found, key=lambda p: p.encode())


def api_hash(frozen_dir: str) -> str:
    listing = []
    for relative in aidl_files(frozen_dir):
        with open(os.path.join(frozen_dir, relative), 'rb') as source:
            digest = hashlib.sha1(source.read()).hexdigest()
        listing.append('%s  ./%s\n' % (digest, relative))
    listing.append('latest-version\n')
    return hashlib.sha1(''.join(listing).encode()).hexdigest()


def frozen_contents(source_root: str) -> List[Tuple[str, bytes]]:
    """(relative path, frozen bytes) of every .aidl file under |source_root|."""
    result = []
    for relative in aidl_files(source_root):
        with open(os.path.join(source_root, relative), 'rb') as source:
            result.append((relative, FROZEN_HEADER.encode() + source.read()))
    return result


def read_hash_file(path: str) -> str:
    with open(path, encoding='ascii') as hash_file:
        return hash_file.read().strip()
