"""What is written about the programs beside them: completion, man pages and the page of the options
agree with --help."""

import pathlib
import re
import shlex
import shutil
import subprocess
import unittest

from zoltenc_runner import ZOLTENC_FILE, ToolTest

ROOT = pathlib.Path(__file__).parents[2]
PROGRAMS = {"zoltenc": ZOLTENC_FILE,
            "avcdump": str(pathlib.Path(ZOLTENC_FILE).with_name("avcdump"))}
COMPLETION = ROOT / "scripts" / "completion" / "zoltenc.bash"


def options_of(program):
    """The short and long options that a program's help lists."""
    text = subprocess.run([PROGRAMS[program], "--help"], capture_output=True, text=True,
                          check=True).stdout
    options = set()
    for line in re.findall(r"^  (-.*)$", text, re.MULTILINE):
        options.update(re.findall(r"--?[a-zA-Z][a-z-]*", re.split(r"[ =]", line, maxsplit=1)[0]))
    return options


def words_of(text):
    """The options that a text names."""
    return set(re.findall(r"(?<![\w-])--?[a-zA-Z][a-z-]*", text))


class Documentation(ToolTest):
    def complete(self, *line):
        """What bash offers for the last word of a command line."""
        program = line[0]
        words = " ".join(shlex.quote(word) for word in (PROGRAMS[program], *line[1:]))
        script = f"""
            source {shlex.quote(str(COMPLETION))}
            COMP_WORDS=({words}) COMP_CWORD={len(line) - 1}
            $(complete -p {program} | sed 's/.*-F \\([^ ]*\\).*/\\1/') "${{COMP_WORDS[0]}}"
            printf '%s\\n' "${{COMPREPLY[@]}}"
            """
        result = subprocess.run(["bash", "-euc", script], cwd=self.folder, capture_output=True,
                                text=True, check=False)
        self.assertEqual((result.returncode, result.stderr), (0, ""))
        return sorted(line for line in result.stdout.split("\n") if line)

    def test_completion_knows_every_long_option(self):
        for program in PROGRAMS:
            expected = {option for option in options_of(program) if option.startswith("--")}
            self.assertGreater(len(expected), 4)
            self.assertEqual(set(self.complete(program, "-")), expected)
        self.assertEqual(self.complete("zoltenc", "a.mp4", "--keyi"), ["--keyint"])

    def test_completion_of_values_and_files(self):
        for name in ("a clip.mkv", "a clip.mp4", "b$.y4m"):
            self.write(name, b"")
        for line, expected in (
            (["zoltenc", "a"], ["a clip.mkv", "a clip.mp4"]),
            (["zoltenc", "b"], ["b$.y4m"]),
            (["zoltenc", "synt"], ["synthetic"]),
            (["zoltenc", "-o", "a"], ["a clip.mkv", "a clip.mp4"]),
            (["zoltenc", "-f", "Y"], ["YUY2"]),
            (["zoltenc", "--fit", "=", "s"], ["scale"]),
            (["zoltenc", "--fit", "="], ["crop", "pad", "scale"]),
            (["zoltenc", "-b", ""], []),
            (["avcdump", "--fps", "30"], ["30", "30000/1001"]),
            (["avcdump", "a"], ["a clip.mkv", "a clip.mp4"]),
        ):
            with self.subTest(line=line):
                self.assertEqual(self.complete(*line), expected)

    def test_completed_values_are_taken(self):
        for option in ("--format", "--size", "--fps", "--fit", "--container"):
            values = self.complete("zoltenc", option, "")
            self.assertGreater(len(values), 2)
            for value in values:
                with self.subTest(option=option, value=value):
                    self.write("in.y4m", b"")
                    size = ["--size", "64x64"] if option == "--format" else []
                    result = self.zoltenc("in.y4m", *size, option, value,
                                          *([] if value == "null" else ["-o", "out.264"]))
                    self.assert_fails(result, 1, "in.y4m", "empty")

    def test_pages_describe_every_option_and_no_other(self):
        for program in PROGRAMS:
            page = (ROOT / "docs" / "man" / f"{program}.1").read_text(encoding="utf-8")
            with self.subTest(program=program):
                tags = re.findall(r"^\.TP\n(.*)$", page, re.MULTILINE)
                described = words_of("\n".join(tags).replace("\\-", "-").replace("\\fR", "").replace(
                    "\\fB", ""))
                self.assertEqual(options_of(program) ^ described, set())
        table = (ROOT / "docs" / "command-line.md").read_text(encoding="utf-8")
        self.assertEqual(options_of("zoltenc") - words_of(table), set())

    @unittest.skipUnless(shutil.which("man"), "not run: man is not installed")
    def test_man_pages_have_no_faults(self):
        for program in PROGRAMS:
            with self.subTest(program=program):
                page = ROOT / "docs" / "man" / f"{program}.1"
                result = subprocess.run(["man", "--warnings", "--encoding=utf8", "-l", "-P", "cat", page],
                                        capture_output=True, text=True, check=True,
                                        env={"PATH": "/usr/bin:/bin", "MANWIDTH": "80", "LC_ALL": "C.UTF-8"})
                self.assertEqual(result.stderr, "")
                self.assertIn(f"{program} ", result.stdout)


if __name__ == "__main__":
    unittest.main()
