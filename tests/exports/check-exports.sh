#!/bin/sh
# Compares the dynamic symbols the library defines with the expected list,
# leaving out the markers the toolchain adds (_init, _fini, __bss_start...).
set -eu
library=$1
expected=$2
actual=$(nm -D --defined-only "$library" | awk '{print $3}' \
	| grep -v -E '^(_init|_fini|_edata|_end|__bss_start)$' | sort)
if [ "$actual" != "$(sort "$expected")" ]; then
	echo "exported symbols differ from $expected:"
	echo "$actual" | diff "$expected" - || true
	exit 1
fi
readelf -d "$library" | grep -q 'Library soname: \[libeditor-svc.so.1\]' || {
	echo "SONAME is not libeditor-svc.so.1"
	exit 1
}
echo "exports ok: $(echo "$actual" | wc -l) symbols"
