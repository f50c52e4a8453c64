#!/usr/bin/env bash
# Installs the build into a temporary prefix and uses it as a recorder would: checks what went
# where, runs the installed programs, and builds and runs a tiny host (tests/install/host)
# against the installed library, once found with find_package and once with pkg-config. Then
# a DESTDIR install into a staging folder. Prints every check; exits 1 on the first failure.
#
# Usage: install_test.sh CMAKE BUILD_DIR SOURCE_DIR LIBDIR BINDIR INCLUDEDIR MANDIR DOCDIR
#        (the CMAKE_INSTALL_* folders the build was configured with, relative to the prefix)
set -euo pipefail

if [ $# -ne 8 ]; then
  echo "usage: $0 CMAKE BUILD_DIR SOURCE_DIR LIBDIR BINDIR INCLUDEDIR MANDIR DOCDIR" >&2
  exit 2
fi
cmake=$1 build=$2 src=$3 libdir=$4 bindir=$5 includedir=$6 mandir=$7 docdir=$8

tmp=$(mktemp -d "${TMPDIR:-/tmp}/evwatch-install-test.XXXXXX")
# An install rewrites the build's install manifest, which a user's uninstall may rely on:
# keep theirs.
manifest=$build/install_manifest.txt
[ -f "$manifest" ] && cp -p "$manifest" "$tmp/manifest.saved"
cleanup() {
  if [ -f "$tmp/manifest.saved" ]; then cp -p "$tmp/manifest.saved" "$manifest"; else rm -f "$manifest"; fi
  rm -rf "$tmp"
}
trap cleanup EXIT

fail() { echo "FAILED: $*" >&2; exit 1; }
ok() { echo "ok: $*"; }
expect_file() { [ -f "$1" ] || fail "missing $1"; }

prefix=$tmp/prefix
echo "== cmake --install $build --prefix $prefix"
"$cmake" --install "$build" --prefix "$prefix" > "$tmp/install.log" || { cat "$tmp/install.log"; fail "cmake --install"; }
ok "installed $(grep -c '^-- Installing' "$tmp/install.log") files"

echo "== layout"
for f in "$libdir/libeventdetector.so" "$libdir/libevhost.so" \
         "$libdir/pkgconfig/eventdetector.pc" "$libdir/pkgconfig/evhost.pc" \
         "$libdir/cmake/evwatch/evwatchConfig.cmake" "$libdir/cmake/evwatch/evwatchConfigVersion.cmake" \
         "$libdir/cmake/evwatch/evwatchTargets.cmake" \
         "$bindir/evwatch" "$bindir/camsim" "$mandir/man1/evwatch.1" "$mandir/man1/camsim.1" \
         "$docdir/examples/evwatch.example.yaml" lib/systemd/system/evwatch.service; do
  expect_file "$prefix/$f"
done
ok "libraries, pkg-config files, CMake package, programs, man pages, example, unit"

# The headers are exactly those of framework/ (with the host contract) and detectors/.
inc=$prefix/$includedir/evwatch
(cd "$src" && find framework detectors -name '*.h' | sort) > "$tmp/headers.want"
(cd "$inc" && find . -type f | sed 's|^\./||' | sort) > "$tmp/headers.got"
diff -u "$tmp/headers.want" "$tmp/headers.got" || fail "installed headers differ from framework/ and detectors/"
[ -e "$inc/host" ] && fail "libevhost's internals (host/) were installed"
for h in framework/detector.h framework/host/camera.h detectors/canon.h detectors/media/jpegmd.h \
         detectors/acti/actidetector.h; do
  expect_file "$inc/$h"
done
ok "$(wc -l < "$tmp/headers.got") headers under $includedir/evwatch, no host/"

unit=$prefix/lib/systemd/system/evwatch.service
grep -qx "ExecStart=$prefix/$bindir/evwatch run -c /etc/evwatch/evwatch.yaml" "$unit" \
  || fail "the unit's ExecStart: $(grep ExecStart "$unit")"
grep -qx 'ExecReload=/bin/kill -HUP $MAINPID' "$unit" || fail "the unit's ExecReload: $(grep ExecReload "$unit")"
ok "unit runs $prefix/$bindir/evwatch run -c /etc/evwatch/evwatch.yaml, reloads with SIGHUP"

echo "== installed programs"
for program in evwatch camsim; do
  runpath=$(readelf -d "$prefix/$bindir/$program" | sed -n 's/.*(RUNPATH).*\[\(.*\)\]/\1/p')
  [[ "$runpath" == '$ORIGIN/'* ]] || fail "$program's RUNPATH is '$runpath', not \$ORIGIN/..."
  # An empty entry would make the loader search the current folder.
  [[ "$runpath" == *: || "$runpath" == *::* ]] && fail "$program's RUNPATH '$runpath' has an empty entry"
done
resolved=$(env -u LD_LIBRARY_PATH ldd "$prefix/$bindir/evwatch" | awk '/libeventdetector/ {print $3}')
[ -n "$resolved" ] && [ "$(readlink -f "$resolved")" = "$(readlink -f "$prefix/$libdir/libeventdetector.so.0")" ] \
  || fail "installed evwatch loads libeventdetector from '$resolved'"
ok "RUNPATH $runpath (evwatch, camsim); evwatch loads $resolved"
version=$(env -u LD_LIBRARY_PATH "$prefix/$bindir/evwatch" --version)
[[ "$version" == "evwatch "* ]] || fail "evwatch --version said '$version'"
ok "$version"
out=$("$prefix/$bindir/evwatch" check -c "$prefix/$docdir/examples/evwatch.example.yaml")
[[ "$out" == *": ok: 3 camera(s), 5 detector(s)" ]] || fail "evwatch check of the example: $out"
ok "$out"
if command -v man >/dev/null 2>&1; then
  for page in evwatch camsim; do
    warnings=$(LC_ALL=C.UTF-8 MANWIDTH=100 man --warnings -l "$prefix/$mandir/man1/$page.1" 2>&1 >/dev/null || echo "man failed")
    [ -z "$warnings" ] || fail "man $page.1: $warnings"
  done
  ok "man pages format without warnings"
fi
# The demo must run the camsim installed beside evwatch: the PATH is an empty folder and
# EVWATCH_CAMSIM is unset.
mkdir "$tmp/empty-path"
demo=$(cd "$tmp" && env -u EVWATCH_CAMSIM PATH="$tmp/empty-path" "$prefix/$bindir/evwatch" demo --duration 3 2>&1) \
  || { echo "$demo"; fail "evwatch demo"; }
summary=$(echo "$demo" | grep -E '^demo: [0-9]+ events from [0-9]+ cameras' || true)
[ -n "$summary" ] || { echo "$demo" | tail -5; fail "evwatch demo printed no summary"; }
ok "installed demo ran the camsim beside it: ${summary%% (*}"

# What the unit's reload does: SIGHUP makes the installed evwatch read its file again. One
# detector on a closed loopback port reports at once; once it has, evwatch handles signals.
port=$(python3 -c 'import socket; s=socket.socket(); s.bind(("127.0.0.1", 0)); print(s.getsockname()[1])')
cat > "$tmp/reload.yaml" <<EOF
cameras:
  - {name: closed, host: 127.0.0.1, port: $port, detectors: [{class: CanonMD, name: motion}]}
EOF
"$prefix/$bindir/evwatch" run -c "$tmp/reload.yaml" --duration 120 > "$tmp/reload.out" 2> "$tmp/reload.err" &
pid=$!
# A bounded wait for a condition (at most 60 s), not a measurement.
wait_for() {
  local i
  for i in $(seq 600); do
    if grep -q "$1" "$2"; then return 0; fi
    kill -0 "$pid" 2>/dev/null || return 1
    sleep 0.1
  done
  return 1
}
wait_for '"detector":"motion"' "$tmp/reload.out" || { cat "$tmp/reload.err"; kill "$pid"; fail "evwatch run printed no reading"; }
kill -HUP "$pid"
wait_for 'evwatch: reloaded' "$tmp/reload.err" || { cat "$tmp/reload.err"; kill "$pid"; fail "evwatch did not reload on SIGHUP"; }
kill -TERM "$pid"
status=0
wait "$pid" || status=$?
[ "$status" -eq 0 ] || { cat "$tmp/reload.err"; fail "evwatch ended with status $status after SIGHUP and SIGTERM"; }
ok "SIGHUP: $(grep -o 'evwatch: reloaded.*' "$tmp/reload.err" | sed "s|$tmp/||")"

# A host build with only the prefix: include flags name the prefix and never evwatch's tree.
build_host() {
  local how=$1 dir=$tmp/host-$1
  shift
  echo "== host built with $how"
  "$cmake" -S "$src/tests/install/host" -B "$dir" -DEVW_FIND_WITH="$how" \
    -DCMAKE_EXPORT_COMPILE_COMMANDS=ON "$@" > "$dir.configure.log" 2>&1 \
    || { cat "$dir.configure.log"; fail "configure the host with $how"; }
  "$cmake" --build "$dir" > "$dir.build.log" 2>&1 || { cat "$dir.build.log"; fail "build the host with $how"; }
  if [ "$how" = package ]; then
    local found
    found=$(sed -n 's/^evwatch_DIR:PATH=//p' "$dir/CMakeCache.txt")
    [ "$(readlink -f "$found")" = "$(readlink -f "$prefix/$libdir/cmake/evwatch")" ] \
      || fail "find_package(evwatch) found '$found'"
    ok "find_package(evwatch) found $found"
  else
    grep -q "Found eventdetector, version" "$dir.configure.log" || { cat "$dir.configure.log"; fail "pkg-config found no eventdetector"; }
    ok "pkg-config: $(grep -o 'Found eventdetector, version.*' "$dir.configure.log")"
  fi
  local includes
  includes=$(grep -o -- '-I[^ "]*\|-isystem [^ "]*' "$dir/compile_commands.json" | sort -u | tr '\n' ' ')
  [[ "$includes" == *"$prefix/$includedir/evwatch "* ]] || fail "host include flags lack the prefix: $includes"
  [[ "$includes" == *"$src"* || "$includes" == *"$build"* ]] && fail "host include flags reach into evwatch's tree: $includes"
  ok "include flags: $includes"
  local needed
  needed=$(readelf -d "$dir/host" | grep NEEDED | grep -o 'lib\(eventdetector\|evhost\)[^]]*' | tr '\n' ' ')
  [[ "$needed" == *libeventdetector.so.0* && "$needed" == *libevhost.so.0* ]] || fail "host links $needed"
  local loads
  loads=$(env -u LD_LIBRARY_PATH ldd "$dir/host" | awk '/libeventdetector|libevhost/ {print $3}' | tr '\n' ' ')
  for lib in $loads; do
    [[ "$(readlink -f "$lib")" == "$(readlink -f "$prefix")/"* ]] || fail "host loads $lib, not the prefix's"
  done
  ok "host links $needed from $loads"
  env -u LD_LIBRARY_PATH "$dir/host" || fail "the host built with $how"
}
build_host package -DCMAKE_PREFIX_PATH="$prefix"
PKG_CONFIG_PATH=$prefix/$libdir/pkgconfig build_host pkg-config

echo "== DESTDIR"
stage=$tmp/stage
DESTDIR=$stage "$cmake" --install "$build" --prefix /opt/evwatch > "$tmp/stage.log" \
  || { cat "$tmp/stage.log"; fail "DESTDIR install"; }
outside=$(cd "$stage" && find . -mindepth 1 -maxdepth 2 | grep -vx '\./opt\|\./opt/evwatch' || true)
[ -z "$outside" ] || fail "DESTDIR install wrote outside opt/evwatch: $outside"
expect_file "$stage/opt/evwatch/$bindir/evwatch"
expect_file "$stage/opt/evwatch/$libdir/libeventdetector.so"
grep -qx 'prefix=/opt/evwatch' "$stage/opt/evwatch/$libdir/pkgconfig/eventdetector.pc" \
  || fail "eventdetector.pc under DESTDIR: $(head -1 "$stage/opt/evwatch/$libdir/pkgconfig/eventdetector.pc")"
grep -qx 'ExecStart=/opt/evwatch/'"$bindir"'/evwatch run -c /etc/evwatch/evwatch.yaml' \
  "$stage/opt/evwatch/lib/systemd/system/evwatch.service" || fail "the unit's ExecStart under DESTDIR"
ok "DESTDIR=$stage --prefix /opt/evwatch: all under $stage/opt/evwatch, files name /opt/evwatch"

echo "install test: all checks passed"
