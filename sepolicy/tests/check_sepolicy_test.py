"""The policy check refuses each kind of broken policy it promises to catch."""

import os
import shutil
import subprocess
import sys
import tempfile
import unittest

ROOT = os.path.dirname(os.path.dirname(os.path.dirname(os.path.abspath(__file__))))
SCRIPT = os.path.join(ROOT, 'scripts', 'check-sepolicy')
HAL = 'hal_dalix_uwb_default'

# (file to append to, text appended, what the report must name)
BREAKAGES = [
    ('file.te', 'allow %s nosuch_file:file read;\n' % HAL, 'nosuch_file'),
    ('file.te', 'type other_file, nosuch_attribute;\n', 'nosuch_attribute'),
    ('file.te', 'binder_call(%s, nosuch_client)\n' % HAL, 'nosuch_client'),
    ('file.te', 'nosuch_macro(%s)\n' % HAL, 'nosuch_macro'),
    ('file.te', 'allow %s self:udp_socket read\n' % HAL, 'not a rule'),
    ('file.te', 'allow %s self:udp_socket { read;\n' % HAL, 'unbalanced'),
    ('file_contexts', '/vendor/x u:object_r:nosuch_file:s0\n', 'nosuch_file'),
    ('service_contexts', 'aidl.x.IFoo/default nosuch\n', 'service_contexts:2'),
]


class CheckSepolicyTest(unittest.TestCase):
    def test_each_breakage_fails_naming_its_cause(self):
        for name, text, expected in BREAKAGES:
            with self.subTest(text), tempfile.TemporaryDirectory() as work:
                policy = os.path.join(work, 'sepolicy')
                shutil.copytree(os.path.join(ROOT, 'sepolicy'), policy)
                with open(os.path.join(policy, name), 'a') as f:
                    f.write(text)
                result = subprocess.run([sys.executable, '-B', SCRIPT, '--policy-dir', policy],
                                        capture_output=True, text=True)
                self.assertEqual(1, result.returncode, result.stdout)
                self.assertIn(expected, result.stdout)
