"""Tests of the interface library generator and of the frozen API."""

import filecmp
import glob
import os
import pathlib
import shutil
import subprocess
import sys
import tempfile
import unittest

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, os.path.dirname(HERE))

import aidl_gen  # noqa: E402
import api_dump  # noqa: E402
from aidl_parser import AidlError, parse_package  # noqa: E402

SOURCE_DIR = os.environ.get('DALIX_SOURCE_DIR',
                            os.path.abspath(os.path.join(HERE, '..', '..', '..')))
AIDL_ROOT = os.path.join(SOURCE_DIR, 'aidl')
PACKAGE_DIR = os.path.join(AIDL_ROOT, 'aidl', 'hardware', 'dalix', 'uwb')
API_DIR = os.path.join(AIDL_ROOT, 'aidl_api', 'aidl.hardware.dalix.uwb')
GENERATOR = os.path.join(os.path.dirname(HERE), 'aidl_gen.py')

HEAD = 'package aidl.hardware.dalix.uwb;\n'


class GeneratorTest(unittest.TestCase):
    def setUp(self):
        self.dir = tempfile.mkdtemp()
        self.addCleanup(shutil.rmtree, self.dir)

    def write(self, name, text):
        """|text| follows the package line, and @VintfStability unless it imports."""
        path = os.path.join(self.dir, name + '.aidl')
        with open(path, 'w') as out:
            out.write(HEAD + ('' if text.startswith('import') else '@VintfStability\n') + text)
        return path

    def test_unsupported_constructs_name_file_line_and_reason(self):
        cases = [
            ('IOneway', 'interface IOneway {\n    oneway void f();\n}\n', 4,
             'oneway methods are not supported'),
            ('Big', '@Backing(type="byte")\nenum Big {\n    A = 127,\n    B,\n}\n', 6,
             'does not fit the byte backing'),
            ('Holder', 'parcelable Holder {\n\n    Map<String, String> m;\n}\n', 5,
             'type Map is not supported by the NDK back end'),
            ('Unimported', 'parcelable Unimported {\n    Other o;\n}\n', 4,
             "Failed to resolve 'Other'"),
            ('Unknown', 'parcelable Unknown {\n    aidl.hardware.dalix.uwb.Nowhere n;\n}\n', 4,
             "Failed to resolve 'Nowhere'"),
            ('Foreign', 'parcelable Foreign {\n    android.os.Thing t;\n}\n', 4,
             "Failed to resolve 'android.os.Thing'"),
            ('IInout', 'interface IInout {\n    void f(inout int x);\n}\n', 4,
             "'int x' can be an in parameter only"),
            ('ITwice', 'interface ITwice {\n    void f(int x, long x);\n}\n', 4,
             "method 'f' has duplicate argument name 'x'"),
            ('Lonely', 'import aidl.hardware.dalix.uwb.Missing;\n@VintfStability\n'
             'parcelable Lonely {\n}\n', 2,
             "Couldn't find import for class aidl.hardware.dalix.uwb.Missing"),
            ('Twice', 'import aidl.hardware.dalix.uwb.Other;\nimport aidl.hardware.dalix.uwb.Other;\n',
             3, 'import aidl.hardware.dalix.uwb.Other is duplicated'),
        ]
        for name, text, line, reason in cases:
            with self.subTest(name):
                path = self.write(name, text)
                other = self.write('Other', 'parcelable Other {\n    int x;\n}\n')
                with self.assertRaises(AidlError) as caught:
                    parse_package([path, other])
                self.assertTrue(str(caught.exception).startswith('%s:%d: ' % (path, line)),
                                str(caught.exception))
                self.assertIn(reason, caught.exception.reason)
        run = subprocess.run([sys.executable, '-B', GENERATOR, 'outputs', '--out', self.dir,
                              self.write('IBad', 'interface IBad {\n    union x;\n}\n')],
                             capture_output=True, text=True)
        self.assertEqual((1, ''), (run.returncode, run.stdout))
        self.assertEqual('aidl_gen: error: %s:4: nested "union" declarations are not supported\n'
                         % os.path.join(self.dir, 'IBad.aidl'), run.stderr)

    def test_output_is_deterministic_and_listed_in_advance(self):
        second = os.path.join(self.dir, 'second')
        sources = sorted(glob.glob(os.path.join(PACKAGE_DIR, '*.aidl')))
        for out, order in ((self.dir, sources), (second, list(reversed(sources)))):
            self.assertEqual(0, aidl_gen.main(['generate', '--out', out, '--api-dir', API_DIR,
                                               '--version', '1'] + order))
        written = sorted(os.path.relpath(os.path.join(d, n), self.dir)
                         for d, _, names in os.walk(self.dir) for n in names
                         if not d.startswith(second))
        listing = subprocess.run([sys.executable, '-B', GENERATOR, 'outputs', '--out', self.dir]
                                 + sources, capture_output=True, text=True, check=True).stdout
        self.assertEqual(sorted(os.path.relpath(p, self.dir) for p in listing.split(';')), written)
        _, mismatch, errors = filecmp.cmpfiles(self.dir, second, written, shallow=False)
        self.assertEqual([], mismatch + errors)

    def test_a_wrong_hash_file_stops_generation(self):
        api = os.path.join(self.dir, 'api')
        shutil.copytree(API_DIR, api)
        with open(os.path.join(api, '1', '.hash'), 'w') as hash_file:
            hash_file.write('0' * 40 + '\n')
        with self.assertRaisesRegex(aidl_gen.GenerateError, 'records 0{40}'):
            aidl_gen.frozen_hash(api, 1)


def hash_recipe(frozen, previous):
    """The platform build's own shell recipe for the hash of a frozen version."""
    recipe = ('(cd "$0" && find ./ -name "*.aidl" -print0 | LC_ALL=C sort -z | '
              'xargs -0 sha1sum && echo "$1") | sha1sum')
    run = subprocess.run(['sh', '-c', recipe, frozen, previous], capture_output=True, text=True,
                         check=True)
    return run.stdout.split()[0]


def read_tree(root):
    return {r: pathlib.Path(root, r).read_bytes() for r in api_dump.aidl_files(root)}


class FrozenApiTest(unittest.TestCase):
    def setUp(self):
        self.sources = sorted(glob.glob(os.path.join(PACKAGE_DIR, '*.aidl')))

    def test_frozen_dumps_are_the_sources_dump_and_the_hash_is_the_recipe(self):
        expected = dict(api_dump.frozen_contents(parse_package(self.sources)))
        self.assertEqual(34, len(expected))
        for version in ('1', 'current'):
            self.assertEqual(expected, read_tree(os.path.join(API_DIR, version)), version)
        frozen = os.path.join(API_DIR, '1')
        computed = api_dump.api_hash(frozen, 1)
        self.assertEqual(api_dump.read_hash_file(os.path.join(frozen, '.hash')), computed)
        self.assertEqual(hash_recipe(frozen, 'latest-version'), computed)
        # A dump names every type in full and imports nothing, and reads back the same.
        dumps = [os.path.join(frozen, p) for p in expected]
        self.assertEqual(expected, dict(api_dump.frozen_contents(parse_package(dumps))))

    def test_a_later_version_hashes_with_the_version_before_it(self):
        api = os.path.join(tempfile.mkdtemp(), 'aidl_api')
        self.addCleanup(shutil.rmtree, os.path.dirname(api))
        shutil.copytree(API_DIR, api)
        freeze = [sys.executable, '-B', GENERATOR, 'freeze', '--api-dir', api]
        subprocess.run(freeze + ['--version', '2'] + self.sources, check=True)
        version2 = os.path.join(api, '2')
        self.assertEqual(read_tree(os.path.join(API_DIR, '1')), read_tree(version2))
        recorded = api_dump.read_hash_file(os.path.join(version2, '.hash'))
        self.assertEqual(hash_recipe(version2, '1'), recorded)
        self.assertEqual(recorded, aidl_gen.frozen_hash(api, 2))
        for version in ('2', '4'):
            with self.subTest(version):
                run = subprocess.run(freeze + ['--version', version] + self.sources,
                                     capture_output=True, text=True)
                self.assertEqual(1, run.returncode)
                self.assertIn('frozen already' if version == '2' else 'must follow', run.stderr)


if __name__ == '__main__':
    unittest.main()
