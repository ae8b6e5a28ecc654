#!/usr/bin/env bash
# test-packages.sh build SOURCE WORK
#   Builds the Debian packages with `ie package` (its own tree under WORK),
#   unpacks them into a fresh root, WORK/root, and checks them there: the
#   four packages, lintian, declared dependencies that this system can meet,
#   every library a binary needs found inside the root or in Debian's
#   packages, no path into the build tree, and a host compiled against the
#   root through `pkg-config editor-svc`.
# test-packages.sh demo SOURCE WORK
#   Runs the installed demo from that root, seen at /usr in a private mount
#   namespace (the library looks for its resources at their absolute
#   installed path): rotate and save a picture, and open the bundled sample
#   with the compiled-in defaults.
# Exits 77 (skipped) with the reason when this machine cannot do it.
set -uo pipefail
mode=$1 source=$2 work=$3
root=$work/root
packages=(libeditor-svc1 libeditor-svc-dev editor-svc-platform editor-svc-demo)
multiarch=$(gcc -print-multiarch 2>/dev/null || echo x86_64-linux-gnu)
libdir=$root/usr/lib/$multiarch

failures=0
fail() { echo "FAIL: $*"; failures=$((failures + 1)); }
skip() { echo "skipped: $*"; exit 77; }
finish() { [ "$failures" -eq 0 ] && echo "packages ok" || echo "$failures check(s) failed"; exit $((failures > 0)); }

# Prints the path of every library that `ldd` resolves for $1, or fails for
# those it cannot find.
resolved_libraries() {
	LD_LIBRARY_PATH=$libdir ldd "$1" | while read -r name arrow path _; do
		if [ "$path" = "not" ]; then
			echo "missing:$name"
		elif [ "$arrow" = "=>" ] && [ -n "$path" ]; then
			echo "$path"
		fi
	done
}

# names_dir FLAGS -I|-L DIR: one of the flags names DIR, by any path.
names_dir() {
	local flag
	for flag in $1; do
		[[ $flag == "$2"* ]] && [ "$(readlink -f "${flag#"$2"}")" = "$3" ] && return 0
	done
	return 1
}

build_and_install() {
	# A root left by an earlier run must not stand in for this one's.
	rm -rf "$work/debs" "$root"
	for tool in dpkg-deb dpkg-shlibdeps cpack file apt-get; do
		command -v $tool >/dev/null || skip "$tool is not installed: the packages cannot be built here"
	done
	# A packaging build cut off (by this test's timeout) can leave a
	# truncated object newer than its source, which the next build would
	# link as it is: a build that did not finish is started afresh.
	local unfinished=$work/build-unfinished
	[ -e "$unfinished" ] && rm -rf "$work/build"
	mkdir -p "$work/debs" "$root"
	touch "$unfinished"
	local listing
	listing=$(IE_PACKAGE_BUILD_DIR=$work/build "$source/ie" package "$work/debs" 2>&1) || {
		echo "$listing"
		fail "./ie package failed"
		finish
	}
	rm -f "$unfinished"
	echo "$listing" | tail -n 4

	# The four packages, and what `ie package` printed is what it built.
	for package in "${packages[@]}"; do
		local deb
		deb=$(ls "$work/debs/${package}"_*.deb 2>/dev/null)
		[ -n "$deb" ] || { fail "no $package package"; continue; }
		echo "$listing" | grep -qxF "$deb" || fail "./ie package did not print $deb"
		dpkg-deb -x "$deb" "$root"
	done
	[ "$failures" -eq 0 ] || finish

	if command -v lintian >/dev/null; then
		local report
		report=$(lintian --allow-root "$work"/debs/*.deb 2>&1)
		echo "$report" | grep '^E:' && fail "lintian reports errors"
		echo "lintian: $(echo "$report" | grep -c '^W:') warning(s), no errors"
	else
		echo "note: lintian is not installed, the packages were not linted"
	fi

	# apt can install the four here: every dependency is met by this system,
	# Debian's archive or one of ours. The editor and the demo name the
	# toolkit and the platform services.
	local plan
	plan=$(apt-get -s -q --no-install-recommends install "$work"/debs/*.deb 2>&1) ||
		fail "apt cannot install the packages: $plan"
	for deb in "$work"/debs/*.deb; do
		local package depends
		package=$(dpkg-deb -f "$deb" Package)
		depends=$(dpkg-deb -f "$deb" Depends)
		case $package in
		libeditor-svc1 | editor-svc-demo)
			[[ $depends == *libelementary1* ]] || fail "$package does not depend on the toolkit: $depends"
			[[ $depends == *"editor-svc-platform "*"| editor-svc-platform-services"* ]] ||
				fail "$package does not depend on the platform services: $depends"
			;;
		esac
	done

	# Every library a binary needs resolves inside the root or to a file of a
	# Debian package; our own are the root's.
	local binaries=("$libdir"/libeditor-svc.so.1 "$root"/usr/bin/editor-svc-demo "$libdir"/editor-svc/*.so "$libdir"/lib*.so.[0-9])
	local needed="" binary
	for binary in "${binaries[@]}"; do
		[ -e "$binary" ] || { fail "$binary is not installed"; continue; }
		needed+=$(resolved_libraries "$binary" | sed "s|^|${binary#"$root"} |")$'\n'
	done
	grep ' missing:' <<<"$needed" | while read -r binary path; do
		echo "FAIL: $binary needs ${path#missing:}, which is not found"
	done
	grep -q ' missing:' <<<"$needed" && fail "libraries not found"
	# One query for all: dpkg knows a file by the path it installed it to,
	# which may differ from ldd's by a symbolic link (/lib, /usr/lib).
	local outside owned path
	outside=$(awk '{print $2}' <<<"$needed" | grep -v -e '^missing:' -e "^$root/" -e '^$' | sort -u)
	owned=$(for path in $outside; do echo "$path"; readlink -f "$path"; done | sort -u |
		xargs -r dpkg -S 2>/dev/null | sed 's/.*: //')
	for path in $outside; do
		grep -qxF -e "$path" -e "$(readlink -f "$path")" <<<"$owned" ||
			fail "$path is loaded ($(grep -F " $path" <<<"$needed" | awk '{print $1}' | xargs)) but belongs to no package"
	done
	local editor_libraries
	editor_libraries=$(resolved_libraries "$libdir/libeditor-svc.so.1")
	for soname in libplatform-log.so.0 libcore-vantric-log-client.so.1 libmedia-db.so.0; do
		grep -qxF "$libdir/$soname" <<<"$editor_libraries" ||
			fail "libeditor-svc.so.1 does not load $soname from the root"
	done
	# shellcheck disable=SC2016
	readelf -d "$libdir/libeditor-svc.so.1" | grep -qF 'Library runpath: [$ORIGIN/editor-svc]' ||
		fail "libeditor-svc.so.1 does not look for its effect libraries beside itself"

	# Nothing installed points back into the trees the packages came from.
	local leaks
	leaks=$(grep -rlF -e "$work/build" -e "$source" "$root")
	[ -z "$leaks" ] || fail "installed files refer to the source or build tree: $leaks"

	# A host builds against the unpacked root through pkg-config alone.
	local pc=$libdir/pkgconfig
	local cflags libs
	cflags=$(PKG_CONFIG_PATH=$pc pkg-config --cflags editor-svc) || fail "pkg-config finds no editor-svc in the root"
	libs=$(PKG_CONFIG_PATH=$pc pkg-config --libs editor-svc)
	names_dir "$cflags" -I "$root/usr/include/editor-svc" || fail "pkg-config --cflags does not name the root: $cflags"
	names_dir "$libs" -L "$libdir" || fail "pkg-config --libs does not name the root: $libs"
	# shellcheck disable=SC2046
	LD_LIBRARY_PATH=$libdir cc -Wall -Werror -o "$work/embed-host" "$source/tests/package/embed-host.c" \
		$(PKG_CONFIG_PATH=$pc pkg-config --cflags --libs elementary editor-svc) ||
		fail "a host does not build against the root with pkg-config editor-svc"
	finish
}

run_installed_demo() {
	[ -x "$root/usr/bin/editor-svc-demo" ] || skip "the packages were not built and unpacked (see packages-build-and-install)"
	[ "$(id -u)" -eq 0 ] || skip "not root: the installed demo needs a private mount namespace to see its resources at /usr"
	unshare -m true 2>/dev/null || skip "no private mount namespace here (unshare -m refused)"
	local run=$work/demo-run runtime
	rm -rf "$run"
	mkdir -p "$run/pictures" "$run/home"
	# EFL's runtime directory must have a short path wherever the tree lies.
	runtime=$(mktemp -d "${TMPDIR:-/tmp}/ie-pkg.XXXXXX")
	trap 'rm -rf "$runtime"' EXIT
	cp "$root/usr/share/editor-svc-demo/sample.jpg" "$run/pictures/sample.jpg"
	cat >"$run/installed.sh" <<-EOF
		#!/bin/sh
		# The unpacked root over the system's /usr, seen by this process only.
		mount -t overlay overlay -o lowerdir=$root/usr:/usr /usr || exit 77
		exec env -i PATH=/usr/bin:/bin HOME=$run/home XDG_RUNTIME_DIR=$runtime \\
			ECORE_NO_SYSTEM_MODULES=1 PLATFORM_LOG_LEVEL=E "\$@"
	EOF
	chmod +x "$run/installed.sh"
	installed() { unshare -m --propagation private "$run/installed.sh" "$@"; }

	local output status
	output=$(installed editor-svc-demo "$run/pictures/sample.jpg" --do rotate-right --do 'done' 2>"$run/stderr")
	status=$?
	[ $status -eq 77 ] && skip "an overlay mount over /usr is refused here"
	echo "$output"
	[ $status -eq 0 ] || fail "editor-svc-demo exited with $status: $(cat "$run/stderr")"
	local saved=$run/pictures/sample_e001.jpg
	echo "$output" | grep -qxF "saved: $saved" || fail "the demo did not report saving $saved"
	# The landscape sample, turned a quarter, is saved upright (at the size
	# the editor loaded it).
	local size
	size=$(file "$saved" 2>/dev/null | grep -o 'JPEG image data.*, [0-9]*x[0-9]*,' | grep -o '[0-9]*x[0-9]*,$')
	[ -n "$size" ] || fail "no JPEG saved at $saved"
	size=${size%,}
	[ -z "$size" ] || [ "${size%x*}" -lt "${size#*x}" ] || fail "the saved picture is not turned: $size"

	# Without a picture: the bundled sample, and the demo's data in the
	# user's data directory.
	output=$(installed editor-svc-demo --headless 2>"$run/stderr")
	status=$?
	echo "$output"
	[ $status -eq 0 ] || fail "editor-svc-demo on its sample exited with $status: $(cat "$run/stderr")"
	local shot=$run/home/.local/share/editor-svc-demo/editor.png
	echo "$output" | grep -qxF "screenshot: $shot" || fail "the demo did not write its screenshot into the user's data directory"
	echo "$output" | grep -q '^closed' && fail "the editor closed at once: the bundled sample did not load"
	[ -f "$shot" ] || fail "no screenshot at $shot"
	finish
}

case $mode in
build) build_and_install ;;
demo) run_installed_demo ;;
*) echo "usage: $0 build|demo SOURCE WORK" >&2; exit 2 ;;
esac
