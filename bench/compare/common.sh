# Shared by the comparison scripts of this folder (sourced, not run): the checks
# that a script's programs are there, and its working folder. Each script sets
# SCRIPT (its name in messages) before sourcing this file.

# need_built PATH TARGET: PATH is a built program (of the CMake target TARGET).
need_built() {
  [ -x "$1" ] || { echo "$SCRIPT: $1 not found; build the target $2 first" >&2; exit 2; }
}

# need_tools NAME...: each is on the PATH (or, for time, /usr/bin/time exists).
need_tools() {
  local tool
  for tool in "$@"; do
    if [ "$tool" = time ]; then
      [ -x /usr/bin/time ] && continue
    elif command -v "$tool" >/dev/null; then
      continue
    fi
    echo "$SCRIPT: $tool not found; run scripts/install-bench-deps" >&2
    exit 2
  done
}

# WORK_DIR: the folder given, or a fresh temporary one removed at the end.
if [ -z "${WORK_DIR:-}" ]; then
  WORK_DIR="$(mktemp -d)"
  trap 'rm -rf "$WORK_DIR"' EXIT
fi
