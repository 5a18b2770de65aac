#!/usr/bin/env bash
# The checks that need no build: format, sources that no CMake file lists, syntax of the scripts.
# Prints every finding, then fails if there was one.
set -uo pipefail

cd "$(dirname "${BASH_SOURCE[0]}")/.." || exit
failed=0
fail() {
  echo "check: $*" >&2
  failed=1
}

trees=(src tests bench fuzz)
mapfile -t sources < <(find "${trees[@]}" -name '*.cpp' -o -name '*.c' | sort)
mapfile -t headers < <(find "${trees[@]}" -name '*.h' -o -name '*.hpp' | sort)
[[ ${#sources[@]} -gt 0 ]] || fail "no sources found"
clang-format --dry-run -Werror "${sources[@]}" "${headers[@]}" || fail "clang-format -i would change files"

# A source that is in no target is not compiled, and a test that is not compiled cannot fail. It stands in the
# CMakeLists.txt of its own folder or of one above.
for source in "${sources[@]}"; do
  directory=$(dirname "$source")
  until grep -qsF -- "${source#"$directory"/}" "$directory/CMakeLists.txt"; do
    if [[ $directory == . ]]; then
      fail "no CMakeLists.txt lists $source"
      break
    fi
    directory=$(dirname "$directory")
  done
done

for header in "${headers[@]}"; do
  grep -q -e '^#pragma once' -e '^#ifndef' "$header" || fail "$header can be included twice"
done

mapfile -t scripts < <(find scripts -name '*.sh' | sort)
# SC2317: it does not see that traps call functions.
shellcheck --external-sources --exclude=SC2317 .ci/run "${scripts[@]}" || fail "shellcheck"

mapfile -t python < <(find tests clients scripts -name '*.py' | sort)
python3 - "${python[@]}" <<'PYTHON' || fail "python"
import sys
for path in sys.argv[1:]:
    with open(path, encoding="utf-8") as file:
        compile(file.read(), path, "exec")
PYTHON

exit $failed
