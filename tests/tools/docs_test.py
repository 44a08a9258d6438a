"""The documentation is true: links lead somewhere, shown programs are the tested ones.

usage: docs_test.py PROJECT
"""

import pathlib
import re
import sys
import unittest

PROJECT = pathlib.Path(sys.argv[1])
del sys.argv[1:]


def documents():
    yield from PROJECT.glob("*.md")
    yield from (PROJECT / "docs").rglob("*.md")


class Docs(unittest.TestCase):
    def test_links_lead_to_files(self):
        for document in documents():
            prose = re.sub(r"```.*?```", "", document.read_text(), flags=re.S)
            for target in re.findall(r"\]\(([^)#\s]+)[^)]*\)", prose):
                if "://" not in target:
                    with self.subTest(document=document.name, target=target):
                        self.assertTrue((document.parent / target).exists())

    def test_readme_shows_the_whole_example(self):
        shown = re.findall(r"```cpp\n(.*?)```", (PROJECT / "README.md").read_text(), re.S)
        self.assertEqual(shown, [(PROJECT / "examples" / "readme_example.cpp").read_text()])

    def test_shown_code_is_built(self):
        examples = [path.read_text() for path in (PROJECT / "examples").iterdir() if path.suffix in (".c", ".cpp", ".h")]
        for document in documents():
            for shown in re.findall(r"```(?:c|cpp)\n(.*?)^```$", document.read_text(), re.S | re.M):
                with self.subTest(document=document.name, shown=shown):
                    self.assertTrue(any(shown in example for example in examples))


if __name__ == "__main__":
    unittest.main()
