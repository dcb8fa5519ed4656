"""Tests of the interface library generator and of the frozen API."""

import os
import pathlib
import re
import shutil
import subprocess
import sys
import tempfile
import unittest

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, os.path.dirname(HERE))

import aidl_gen  # noqa: E402
import api_dump  # noqa: E402
from aidl_parser import parse_package  # noqa: E402

SOURCE_DIR = os.environ.get('DALIX_SOURCE_DIR', os.path.join(HERE, '..', '..', '..'))
API_DIR = os.path.join(SOURCE_DIR, 'aidl', 'aidl_api', 'aidl.hardware.dalix.uwb')
SOURCES = sorted(map(str, pathlib.Path(SOURCE_DIR, 'aidl/aidl/hardware/dalix/uwb').glob('*.aidl')))
IMPORT = 'import aidl.hardware.dalix.uwb.'

# (what follows the package line, and @VintfStability unless it imports; line
# of the error; reason). Each file is named after the type it declares.
REFUSALS = [
    ('interface IOneway {\noneway void f();\n}\n', 4, 'oneway methods are not supported'),
    ('@Backing(type="byte")\nenum Big {\nA = 127,\nB,\n}\n', 6, 'does not fit the byte backing'),
    ('parcelable Holder {\n\nMap<String, String> m;\n}\n', 5, 'type Map is not supported by'),
    ('parcelable Unimported {\nOther o;\n}\n', 4, "Failed to resolve 'Other'"),
    ('parcelable Unknown {\naidl.hardware.dalix.uwb.Nowhere n;\n}\n', 4, "resolve 'Nowhere'"),
    ('parcelable Foreign {\nandroid.os.Thing t;\n}\n', 4, "resolve 'android.os.Thing'"),
    ('interface IInout {\nvoid f(inout int x);\n}\n', 4, "'int x' can be an in parameter only"),
    ('interface ITwice {\nvoid f(int x, long x);\n}\n', 4, "'f' has duplicate argument name 'x'"),
    ('interface IBad {\nunion x;\n}\n', 4, 'nested "union" declarations are not supported'),
    (IMPORT + 'Missing;\n@VintfStability\nparcelable Lonely {\n}\n', 2,
     "Couldn't find import for class aidl.hardware.dalix.uwb.Missing"),
    (IMPORT + 'Other;\n' + IMPORT + 'Other;\nparcelable Twice {}\n', 3, 'uwb.Other is duplicated'),
]


def generator(*args):
    run = subprocess.run([sys.executable, '-B', aidl_gen.__file__, *args], capture_output=True,
                         text=True)
    return run.returncode, run.stdout, run.stderr


def hash_recipe(frozen, previous):
    """The platform build's own shell recipe for the hash of a frozen version."""
    recipe = ('(cd "$0" && find ./ -name "*.aidl" -print0 | LC_ALL=C sort -z | '
              'xargs -0 sha1sum && echo "$1") | sha1sum')
    run = subprocess.run(['sh', '-c', recipe, frozen, previous], capture_output=True, text=True,
                         check=True)
    return run.stdout.split()[0]


def read_tree(root):
    return {r: pathlib.Path(root, r).read_bytes() for r in api_dump.aidl_files(root)}


class GeneratorTest(unittest.TestCase):
    def setUp(self):
        self.dir = self.enterContext(tempfile.TemporaryDirectory())

    def write(self, text):
        path = os.path.join(self.dir, re.search(r'(\w+) {', text).group(1) + '.aidl')
        stability = '' if text.startswith('import') else '@VintfStability\n'
        pathlib.Path(path).write_text('package aidl.hardware.dalix.uwb;\n' + stability + text)
        return path

    def test_refusals_name_file_line_and_reason(self):
        other = self.write('parcelable Other {\n    int x;\n}\n')
        for text, line, reason in REFUSALS:
            with self.subTest(text):
                path = self.write(text)
                status, out, err = generator('outputs', '--out', self.dir, path, other)
                self.assertEqual((1, ''), (status, out))
                self.assertTrue(err.startswith('aidl_gen: error: %s:%d: ' % (path, line)), err)
                self.assertIn(reason, err)

    def test_frozen_versions_are_the_sources_dump_hashed_as_the_platform_does(self):
        expected = dict(api_dump.frozen_contents(parse_package(SOURCES)))
        for version in ('1', 'current'):
            self.assertEqual(expected, read_tree(os.path.join(API_DIR, version)), version)

        # A throwaway version 2 hashes with the version before it.
        api = os.path.join(self.dir, 'aidl_api')
        shutil.copytree(API_DIR, api)
        self.assertEqual(0, generator('freeze', '--api-dir', api, '--version', '2', *SOURCES)[0])
        self.assertEqual(expected, read_tree(os.path.join(api, '2')))
        for version, previous in ((1, 'latest-version'), (2, '1')):
            recorded = api_dump.read_hash_file(os.path.join(api, str(version), '.hash'))
            self.assertEqual(hash_recipe(os.path.join(api, str(version)), previous), recorded)
            self.assertEqual(recorded, aidl_gen.frozen_hash(api, version))
        pathlib.Path(api, '1', '.hash').write_text('0' * 40 + '\n')
        for args, reason in ((['freeze', '--version', '2'], 'frozen already'),
                             (['freeze', '--version', '4'], 'must follow'),
                             (['generate', '--out', self.dir, '--version', '1'], 'records 0000')):
            status, _, err = generator(*args, '--api-dir', api, *SOURCES)
            self.assertEqual(1, status)
            self.assertIn(reason, err)
