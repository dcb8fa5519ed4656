"""The API dump of an AIDL package, its frozen versions and their hash.

A frozen version is a directory holding one dump file per declared type, in
the form the platform's compiler writes with --dumpapi: the notice below,
the package line, the type's annotations on one line, then the declaration
with every type of the package fully qualified, members indented by two
blanks, comments dropped, directions and enumerator values as the source
wrote them. Its hash is the one the platform's build computes: sha1 over
the `sha1sum` lines of the .aidl files (relative paths, sorted bytewise)
followed by one line naming the version before it, "latest-version" for
version 1.
"""

import hashlib
import os
from typing import List, Tuple

from aidl_parser import Declaration, TypeRef

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


def api_hash(frozen_dir: str, version: int) -> str:
    """The hash of the frozen |version| kept in |frozen_dir|."""
    listing = []
    for relative in aidl_files(frozen_dir):
        with open(os.path.join(frozen_dir, relative), 'rb') as source:
            digest = hashlib.sha1(source.read()).hexdigest()
        listing.append('%s  ./%s\n' % (digest, relative))
    listing.append('latest-version\n' if version == 1 else '%d\n' % (version - 1))
    return hashlib.sha1(''.join(listing).encode()).hexdigest()


def _type_text(decl: Declaration, ref: TypeRef) -> str:
    if ref.kind == 'List':
        text = 'List<%s>' % _type_text(decl, ref.element)
    elif ref.kind in ('primitive', 'String'):
        text = ref.name
    else:
        text = '%s.%s' % (decl.package, ref.name)
    if ref.is_array:
        text += '[]'
    return ('@nullable ' if ref.nullable else '') + text


def dump(decl: Declaration) -> str:
    """The dump of one checked declaration."""
    lines = ['package %s;' % decl.package]
    if decl.kind == 'enum':
        lines.append('@Backing(type="%s") @VintfStability' % decl.backing)
    else:
        lines.append('@VintfStability')
    lines.append('%s %s {' % (decl.kind, decl.name))
    for (name, _), text in zip(decl.enumerators, decl.enumerator_texts):
        lines.append('  %s = %s,' % (name, text))
    for field in decl.fields:
        lines.append('  %s %s;' % (_type_text(decl, field.type), field.name))
    for method in decl.methods:
        params = ', '.join(
            '%s%s %s' % (p.written_direction + ' ' if p.written_direction else '',
                         _type_text(decl, p.type), p.name) for p in method.params)
        result = 'void' if method.return_type is None else _type_text(decl, method.return_type)
        lines.append('  %s %s(%s);' % (result, method.name, params))
    lines.append('}')
    return FROZEN_HEADER + '\n'.join(lines) + '\n'


def dump_path(decl: Declaration) -> str:
    return os.path.join(*decl.package.split('.'), decl.name + '.aidl')


def frozen_contents(decls: List[Declaration]) -> List[Tuple[str, bytes]]:
    """(relative path, dump bytes) of every declaration, sorted by path."""
    return sorted(((dump_path(d), dump(d).encode()) for d in decls),
                  key=lambda item: item[0].encode())


def read_hash_file(path: str) -> str:
    with open(path, encoding='ascii') as hash_file:
        return hash_file.read().strip()
