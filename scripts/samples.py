"""The samples of a page.

    samples.py extract PAGE FOLDER    writes each program (```cpp, ```cmake, ```ini) to a file there
    samples.py run PAGE [FOLDER]      runs the commands (```console) there, or in an empty folder, and
                                      compares what they print with the page; `...` stands for
                                      anything

A program's name is in its first line; that of a block of CMake is CMakeLists.txt.
"""

import pathlib
import re
import subprocess
import sys
import tempfile


def blocks(page, *languages):
    fence = rf"^```({'|'.join(languages)})\n(.*?)^```$"
    return re.findall(fence, pathlib.Path(page).read_text(encoding="utf-8"), re.DOTALL | re.MULTILINE)


def extract(page, folder):
    for language, text in blocks(page, "cpp", "cmake", "ini"):
        named = re.match(r"(?://|#) (\w+\.\w+)\n", text)
        if language != "cmake" and not named:
            continue  # a part of a file
        file = folder / (named[1] if named else "CMakeLists.txt")
        if not file.exists() or file.read_text() != text:
            file.write_text(text)
        if language == "cpp":
            print(file.stem)


def run(page, folder):
    commands = 0
    for _, text in blocks(page, "console"):
        for command, expected in re.findall(r"^\$ (.*)\n((?:(?!\$ ).*\n)*)", text, re.MULTILINE):
            result = subprocess.run(["bash", "-c", command], cwd=folder, timeout=60, text=True,
                                    stdout=subprocess.PIPE, stderr=subprocess.STDOUT)
            pattern = ".*".join(map(re.escape, expected.split("...")))
            if not re.fullmatch(pattern, result.stdout, re.DOTALL):
                sys.exit(f"$ {command}\nprints:\n{result.stdout}\nbut on the page:\n{expected}")
            commands += 1
    if commands == 0:
        sys.exit("the page has no commands")
    print(f"{commands} commands print what the page says")


if __name__ == "__main__":
    with tempfile.TemporaryDirectory() as empty:
        {"extract": extract, "run": run}[sys.argv[1]](sys.argv[2], pathlib.Path([*sys.argv, empty][3]))
