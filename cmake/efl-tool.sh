#!/bin/sh
# efl-tool.sh HOME COMMAND...: runs an EFL tool of the build with its home
# and caches under HOME and a private runtime directory under the system's
# temporary folder, removed afterwards. efreetd keeps its socket in the
# runtime directory and cannot take a path beyond about 90 characters, so
# that one must not follow the build tree, which may lie deep.
home=$1
shift
runtime=$(mktemp -d "${TMPDIR:-/tmp}/ie-run.XXXXXX") || exit 1
trap 'rm -rf "$runtime"' EXIT
HOME=$home XDG_CACHE_HOME=$home/cache XDG_CONFIG_HOME=$home/config XDG_RUNTIME_DIR=$runtime \
ECORE_NO_SYSTEM_MODULES=1 EINA_LOG_BACKTRACE=-1 ELM_PROFILE_NOSAVE=1 "$@"
