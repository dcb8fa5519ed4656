"""Tests of the interface library generator and of the frozen API."""

import filecmp
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


def package_sources():
    return sorted(os.path.join(PACKAGE_DIR, n) for n in os.listdir(PACKAGE_DIR)
                  if n.endswith('.aidl'))


class RefusalTest(unittest.TestCase):
    def setUp(self):
        self.dir = tempfile.mkdtemp()
        self.addCleanup(shutil.rmtree, self.dir)

    def write(self, name, text):
        path = os.path.join(self.dir, name + '.aidl')
        with open(path, 'w') as out:
            out.write(text)
        return path

    def test_unsupported_constructs_name_file_line_and_reason(self):
        cases = [
            ('IOneway', HEAD + '@VintfStability\ninterface IOneway {\n'
                              '    oneway void f();\n}\n', 4, 'oneway methods are not supported'),
            ('IInout', HEAD + '@VintfStability\ninterface IInout {\n'
                             '    void f(inout int[] v);\n}\n', 4, 'inout parameters'),
            ('IOutInt', HEAD + '@VintfStability\ninterface IOutInt {\n'
                              '    void f(out int v);\n}\n', 4, 'cannot be "out"'),
            ('Unstable', HEAD + 'parcelable Unstable {\n    int a;\n}\n', 2,
             'must be @VintfStability'),
            ('Wide', HEAD + '@VintfStability\n@Backing(type="int")\nenum Wide { A = 0 }\n', 3,
             'only @Backing(type="byte")'),
            ('Big', HEAD + '@VintfStability\n@Backing(type="byte")\nenum Big {\n'
                          '    A = 127,\n    B,\n}\n', 6, 'does not fit the byte backing'),
            ('Holder', HEAD + '@VintfStability\nparcelable Holder {\n'
                             '    Map<String, String> m;\n}\n', 4, 'type Map is not supported'),
            ('Unknown', HEAD + '@VintfStability\nparcelable Unknown {\n\n    Missing m;\n}\n', 5,
             'unknown type Missing'),
        ]
        for name, text, line, reason in cases:
            with self.subTest(name):
                path = self.write(name, text)
                with self.assertRaises(AidlError) as caught:
                    parse_package([path])
                self.assertEqual(line, caught.exception.line, str(caught.exception))
                self.assertIn(reason, caught.exception.reason)
                self.assertTrue(str(caught.exception).startswith('%s:%d: ' % (path, line)))

    def test_command_line_reports_and_fails(self):
        path = self.write('IBad', HEAD + '@VintfStability\ninterface IBad {\n    union x;\n}\n')
        run = subprocess.run([sys.executable, '-B', GENERATOR, 'outputs', '--out', self.dir, path],
                             capture_output=True, text=True)
        self.assertEqual(1, run.returncode)
        self.assertEqual('aidl_gen: error: %s:4: nested "union" declarations are not supported\n'
                         % path, run.stderr)
        self.assertEqual('', run.stdout)


class FrozenApiTest(unittest.TestCase):
    def test_hash_file_matches_the_frozen_version(self):
        frozen = os.path.join(API_DIR, '1')
        computed = api_dump.api_hash(frozen)
        self.assertEqual(api_dump.read_hash_file(os.path.join(frozen, '.hash')), computed)
        self.assertRegex(computed, '^[0-9a-f]{40}$')

    @unittest.skipIf(shutil.which('sha1sum') is None, 'sha1sum is not installed')
    def test_hash_is_the_shell_recipe(self):
        recipe = ('(cd "$0" && find ./ -name "*.aidl" -print0 | LC_ALL=C sort -z | '
                  'xargs -0 sha1sum && echo latest-version) | sha1sum')
        frozen = os.path.join(API_DIR, '1')
        run = subprocess.run(['sh', '-c', recipe, frozen], capture_output=True, text=True,
                             check=True)
        self.assertEqual(run.stdout.split()[0], api_dump.api_hash(frozen))

    def test_frozen_and_current_copies_hold_the_sources(self):
        expected = dict(api_dump.frozen_contents(AIDL_ROOT))
        self.assertEqual(34, len(expected))
        for version in ('1', 'current'):
            with self.subTest(version):
                root = os.path.join(API_DIR, version)
                self.assertEqual(sorted(expected), api_dump.aidl_files(root))
                for relative, data in expected.items():
                    with open(os.path.join(root, relative), 'rb') as frozen:
                        self.assertEqual(data, frozen.read(), relative)

    def test_a_wrong_hash_file_stops_generation(self):
        work = tempfile.mkdtemp()
        self.addCleanup(shutil.rmtree, work)
        api = os.path.join(work, 'api')
        shutil.copytree(API_DIR, api)
        with open(os.path.join(api, '1', '.hash'), 'w') as hash_file:
            hash_file.write('0' * 40 + '\n')
        with self.assertRaises(aidl_gen.GenerateError) as caught:
            aidl_gen.frozen_hash(api, 1)
        self.assertIn('records 0000000000000000000000000000000000000000', str(caught.exception))


class GenerationTest(unittest.TestCase):
    def test_output_is_deterministic_and_listed_in_advance(self):
        first, second = tempfile.mkdtemp(), tempfile.mkdtemp()
        self.addCleanup(shutil.rmtree, first)
        self.addCleanup(shutil.rmtree, second)
        sources = package_sources()
        for out, order in ((first, sources), (second, list(reversed(sources)))):
            self.assertEqual(0, aidl_gen.main(['generate', '--out', out, '--api-dir', API_DIR,
                                               '--version', '1'] + order))
        written = sorted(os.path.relpath(os.path.join(d, n), first)
                         for d, _, names in os.walk(first) for n in names)
        listing = subprocess.run([sys.executable, '-B', GENERATOR, 'outputs', '--out', first]
                                 + sources, capture_output=True, text=True, check=True).stdout
        self.assertEqual(sorted(os.path.relpath(p, first) for p in listing.split(';')), written)
        # 14 enums, 11 parcelables (header + source), 9 interfaces (I, Bn, Bp + source).
        self.assertEqual(14 + 11 * 2 + 9 * 4, len(written))
        match, mismatch, errors = filecmp.cmpfiles(first, second, written, shallow=False)
        self.assertEqual([], mismatch + errors)


if __name__ == '__main__':
    unittest.main()
