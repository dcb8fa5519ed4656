"""Tests of the interface library generator and of the frozen API."""

import filecmp
import glob
import os
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
        path = os.path.join(self.dir, name + '.aidl')
        with open(path, 'w') as out:
            out.write(HEAD + '@VintfStability\n' + text)
        return path

    def test_unsupported_constructs_name_file_line_and_reason(self):
        cases = [
            ('IOneway', 'interface IOneway {\n    oneway void f();\n}\n', 4,
             'oneway methods are not supported'),
            ('Big', '@Backing(type="byte")\nenum Big {\n    A = 127,\n    B,\n}\n', 6,
             'does not fit the byte backing'),
            ('Holder', 'parcelable Holder {\n\n    Map<String, String> m;\n}\n', 5,
             'type Map is not supported'),
        ]
        for name, text, line, reason in cases:
            with self.subTest(name):
                path = self.write(name, text)
                with self.assertRaises(AidlError) as caught:
                    parse_package([path])
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


class FrozenApiTest(unittest.TestCase):
    def test_frozen_copies_hold_the_sources_and_the_hash_is_the_recipe(self):
        expected = dict(api_dump.frozen_contents(AIDL_ROOT))
        self.assertEqual(34, len(expected))
        for version in ('1', 'current'):
            root = os.path.join(API_DIR, version)
            self.assertEqual(sorted(expected), api_dump.aidl_files(root), version)
            for relative, data in expected.items():
                with open(os.path.join(root, relative), 'rb') as frozen:
                    self.assertEqual(data, frozen.read(), relative)
        frozen = os.path.join(API_DIR, '1')
        computed = api_dump.api_hash(frozen)
        self.assertEqual(api_dump.read_hash_file(os.path.join(frozen, '.hash')), computed)
        if shutil.which('sha1sum') is not None:
            recipe = ('(cd "$0" && find ./ -name "*.aidl" -print0 | LC_ALL=C sort -z | '
                      'xargs -0 sha1sum && echo latest-version) | sha1sum')
            run = subprocess.run(['sh', '-c', recipe, frozen], capture_output=True, text=True,
                                 check=True)
            self.assertEqual(run.stdout.split()[0], computed)


if __name__ == '__main__':
    unittest.main()
