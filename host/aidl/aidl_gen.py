#!/usr/bin/env python3
"""Host interface library generator for the HAL's AIDL package.

  aidl_gen.py outputs  --out DIR FILE.aidl...   list the files `generate` writes
  aidl_gen.py generate --out DIR --api-dir DIR --version N FILE.aidl...
  aidl_gen.py hash     --version N DIR         print the hash of frozen version N in DIR
  aidl_gen.py freeze   --api-dir DIR --version N FILE.aidl...

`generate` takes the interface hash from the frozen version N under
--api-dir and refuses to run when that version's .hash file disagrees.
`freeze` writes the API dump of the sources as version N and as `current`,
with the .hash of version N.
Errors are printed as `file:line: reason` and end the program with status 1.
"""

import argparse
import os
import shutil
import sys
from typing import List

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))

import api_dump  # noqa: E402
from aidl_parser import AidlError, parse_package  # noqa: E402
from cpp_writer import CppWriter  # noqa: E402


class GenerateError(Exception):
    pass


def _writer(files: List[str], version: int, api_hash: str) -> CppWriter:
    decls = parse_package(files)
    sources = {}
    for decl in decls:
        # Relative paths keep the output the same wherever the tree lives.
        parts = os.path.abspath(decl.path).split(os.sep)
        sources[decl.name] = '/'.join(parts[-(decl.package.count('.') + 2):])
    return CppWriter(decls, version, api_hash, sources)


def _write_if_changed(path: str, text: str):
    try:
        with open(path, encoding='utf-8') as existing:
            if existing.read() == text:
                return
    except FileNotFoundError:
        pass
    os.makedirs(os.path.dirname(path), exist_ok=True)
    with open(path, 'w', encoding='utf-8') as output:
        output.write(text)


def frozen_hash(api_dir: str, version: int) -> str:
    frozen = os.path.join(api_dir, str(version))
    if not os.path.isdir(frozen):
        raise GenerateError('%s: frozen version %d is missing' % (frozen, version))
    computed = api_dump.api_hash(frozen, version)
    hash_path = os.path.join(frozen, '.hash')
    recorded = api_dump.read_hash_file(hash_path)
    if recorded != computed:
        raise GenerateError('%s: records %s but version %d hashes to %s'
                            % (hash_path, recorded, version, computed))
    return computed


def command_outputs(args):
    # The hash does not change which files are written.
    writer = _writer(args.files, 1, '0' * 40)
    print(';'.join(os.path.join(args.out, path) for path, _ in writer.files()), end='')


def command_generate(args):
    writer = _writer(args.files, args.version, frozen_hash(args.api_dir, args.version))
    for path, text in writer.files():
        _write_if_changed(os.path.join(args.out, path), text)


def command_hash(args):
    print(api_dump.api_hash(args.dir, args.version))


def command_freeze(args):
    frozen = os.path.join(args.api_dir, str(args.version))
    if os.path.exists(frozen):
        raise GenerateError('%s: version %d is frozen already' % (frozen, args.version))
    if args.version > 1 and not os.path.isdir(os.path.join(args.api_dir, str(args.version - 1))):
        raise GenerateError('%s: version %d must follow a frozen version %d'
                            % (frozen, args.version, args.version - 1))
    contents = api_dump.frozen_contents(parse_package(args.files))
    for target in (str(args.version), 'current'):
        shutil.rmtree(os.path.join(args.api_dir, target), ignore_errors=True)
        for relative, data in contents:
            path = os.path.join(args.api_dir, target, relative)
            os.makedirs(os.path.dirname(path), exist_ok=True)
            with open(path, 'wb') as output:
                output.write(data)
    with open(os.path.join(frozen, '.hash'), 'w', encoding='ascii') as hash_file:
        hash_file.write(api_dump.api_hash(frozen, args.version) + '\n')


def main(argv: List[str]) -> int:
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    commands = parser.add_subparsers(dest='command', required=True)
    outputs = commands.add_parser('outputs')
    outputs.add_argument('--out', required=True)
    outputs.add_argument('files', nargs='+')
    outputs.set_defaults(run=command_outputs)
    generate = commands.add_parser('generate')
    generate.add_argument('--out', required=True)
    generate.add_argument('--api-dir', required=True)
    generate.add_argument('--version', type=int, required=True)
    generate.add_argument('files', nargs='+')
    generate.set_defaults(run=command_generate)
    hash_parser = commands.add_parser('hash')
    hash_parser.add_argument('--version', type=int, required=True)
    hash_parser.add_argument('dir')
    hash_parser.set_defaults(run=command_hash)
    freeze = commands.add_parser('freeze')
    freeze.add_argument('--api-dir', required=True)
    freeze.add_argument('--version', type=int, required=True)
    freeze.add_argument('files', nargs='+')
    freeze.set_defaults(run=command_freeze)
    args = parser.parse_args(argv)
    try:
        args.run(args)
    except (AidlError, GenerateError, OSError) as error:
        print('aidl_gen: error: %s' % error, file=sys.stderr)
        return 1
    return 0


if __name__ == '__main__':
    sys.exit(main(sys.argv[1:]))
