"""Compiles and links again what one changed source needs, without the build system, its optimiser and its cache."""

import contextlib
import json
import os
import pathlib
import shlex
import shutil
import subprocess
import sys

from source_copy import Copy, run

DROPPED = ("-O", "-g", "-D_FORTIFY_SOURCE")


class QuickCopy(Copy):
    """A copy that was built once for `targets`, in which one source of `folders` at a time can be exchanged."""

    def __init__(self, folder, folders, targets):
        # What the ordinary build has compiled comes from the compiler's cache. Nobody debugs it.
        linking = "-Wl,--strip-debug" + (" -fuse-ld=lld" if shutil.which("ld.lld") else "")
        super().__init__(folder, "release",
                         *(f"-DCMAKE_{kind}_LINKER_FLAGS={linking}" for kind in ("EXE", "SHARED", "MODULE")))
        if wrong := self.make(*targets):
            sys.exit(wrong)
        entries = json.loads((self.build / "compile_commands.json").read_text())
        self._compilers = {str(pathlib.Path(each["file"]).relative_to(self.sources)): shlex.split(each["command"])
                           for each in entries if self.sources in pathlib.Path(each["file"]).parents}
        self._steps = [step for line in run("ninja", "-C", self.build, "-t", "commands", *targets).stdout.splitlines()
                       for step in line.split(" && ")]
        # A source that does not take the common header is compiled without it.
        self._previous, self._prefixes, self._prefix = None, {}, self._compiled_headers(folders)

    def _compiled_headers(self, folders):
        """A header with all that the folders' sources include, compiled; none where they do not go together."""
        included = [line for folder in folders for source in sorted((self.sources / folder).glob("*.cpp"))
                    for line in source.read_text(encoding="utf-8").splitlines() if line.startswith("#include")]
        header = self.build / "prefix.h"
        header.write_text("\n".join(dict.fromkeys(included)) + "\n")
        command, _ = self._compiler(next(file for file in self._compilers if file.startswith(folders[0] + "/")))
        built = run(*command, "-x", "c++-header", header, "-o", f"{header}.gch", cwd=self.build)
        return ["-include", header] if built.returncode == 0 else []

    def _compiler(self, file):
        """(the command without its input and output, the object)"""
        words = self._compilers[file]
        at = words.index("-o")
        kept = [word for word in words[:at] if not word.startswith(DROPPED) and not word.endswith("ccache")]
        return [*kept, "-O0", "-U_FORTIFY_SOURCE"], words[at + 1]

    def _compile(self, file, prefix):
        command, target = self._compiler(file)
        built = run(*command, *prefix, "-c", self.sources / file, "-o", target, cwd=self.build)
        return "" if built.returncode == 0 else built.stderr or "does not compile"

    @contextlib.contextmanager
    def exchanged(self, file, text):
        """While it lasts, the source is another one, and all that is built of it. Gives what went wrong; empty: nothing."""
        source, target = self.sources / file, self.build / self._compiler(file)[1]
        original, kept = source.read_bytes(), target.read_bytes()
        if file not in self._prefixes:
            self._prefixes[file] = [] if self._compile(file, self._prefix) else self._prefix
        try:
            source.write_text(text, encoding="utf-8")
            yield self._compile(file, self._prefixes[file]) or self._link(file)
        finally:
            source.write_bytes(original)
            target.write_bytes(kept)

    def _link(self, file):
        """Makes everything anew that holds the file's object, or that of the file before."""
        changed = {self._compiler(each)[1] for each in (file, self._previous or file)}
        self._previous = file
        for step in self._steps:
            words = shlex.split(step) if any(each in step for each in changed) else []
            isArchive = bool(words) and os.path.basename(words[0]) == "ar"
            output = words[2] if isArchive else words[words.index("-o") + 1] if "-o" in words else None
            if not output or not changed.intersection(words) - {output}:
                continue
            if isArchive:
                (self.build / output).unlink()
            built = subprocess.run(step, shell=True, capture_output=True, text=True, check=False, cwd=self.build)
            if built.returncode != 0:
                return built.stderr or "does not link"
            changed.add(output)
        return ""
