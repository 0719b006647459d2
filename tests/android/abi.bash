# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
# shellcheck shell=bash disable=SC2154,SC2034 # what it takes and sets is there
#
# What scripts/test-android needs of each ABI: builds it, and finds what it runs on. The
# script sources this file, which takes place, serial, run, fail and quietly from there,
# and sets size and system.

# ABI: its preset, triple, architecture for configure, program loader and processor
declare -A about=(
	[x86_64]='android-x86_64 x86_64-linux-android x86_64-linux linker64 X86-64'
	[x86]='android-x86 i686-linux-android i686-linux linker 80386'
	[arm64-v8a]='android-arm64 aarch64-linux-android aarch64-linux linker64 AArch64'
	[armeabi-v7a]='android-armv7 armv7a-linux-androideabi arm-linux linker ARM'
)
samples=(SpiCheck DeadPixel FingerWait BurnIn QuietRun SensorProbe)
items=(First First_ca First_ca_qsee Second Third Fourth SensorProbe AnItemWithAVeryLongName)

ndk=$(realpath -- "$ANDROID_NDK_ROOT")
if ! "$ndk/toolchains/llvm/prebuilt/linux-x86_64/bin/clang" --version >/dev/null 2>&1; then
	tests/android/stand-in "$ndk" "$place/ndk"
	ndk=$place/ndk
	echo "the NDK's compiler does not run here: $(clang --version | head -n 1) stands in"
fi
export ANDROID_NDK_ROOT=$ndk
tools=$ndk/toolchains/llvm/prebuilt/linux-x86_64

# The host and its items from build $1 in $1/programs, by the compiler and flags that follow.
compile()
{
	local programs=$1/programs item

	rm -rf -- "$programs"
	mkdir -- "$programs"
	"${@:2}" -O1 -Wall -Wextra -Werror -Isrc -o "$programs/scenarios" \
		tests/android/scenarios.c -L"$1" -lquillmark -lmxml
	for item in "${items[@]}"; do
		ln -- "$programs/scenarios" "$programs/$item"
	done
}

build_for()
{
	local preset triple host loader processor built=$place/$1

	read -r preset triple host loader processor <<<"${about[$1]}"
	compiler=("$tools/bin/clang" --target="${triple}28" --sysroot="$tools/sysroot")
	quietly tests/android/source mxml "$place/mxml"
	[[ -e $place/mini-xml-$1/libmxml.so ]] ||
		quietly tests/android/mini-xml "$place/mxml" "$place/mini-xml-$1" "$host" "${compiler[@]}"
	quietly cmake --preset "$preset" -B "$built" -DMINIXML_INCLUDE_DIR="$place/mini-xml-$1" \
		-DMINIXML_LIBRARY="$place/mini-xml-$1/libmxml.so"
	quietly cmake --build "$built" --parallel "$(nproc)"
	compile "$built" "${compiler[@]}" -L"$place/mini-xml-$1" -I"$place/mini-xml-$1" -Wl,--allow-shlib-undefined
	cp -- "$built"/lib*.so "$place/mini-xml-$1/libmxml.so" "$built/programs/"
	cp -- "$built/libexec/quillmark/bin/ps" "$built/programs/"
	size=$(stat --format %s "$built/libquillmark.so")
	((size <= 24576)) || fail "$1: libquillmark.so has $size bytes, more than 24 KB"
	foreign=$(readelf --dyn-syms --wide "$built/libquillmark.so" |
		awk '$7 == "UND" && $8 != "" { sub(/@.*/, "", $8); print $8 }' |
		grep -Evx 'mxml.*|Accept|Bind|Setsockopt|get_node_value|vr_log_printf' |
		grep -Fvx -f <(grep -v '^#' tests/library/libc_names.txt | tr ' ' '\n')) || true
	[[ -z $foreign ]] || fail "$1: not in tests/library/libc_names.txt: ${foreign//$'\n'/ }"
}

# Whether the NDK has a C++ library for ABI $1.
has_cxx()
{
	local triple processor

	read -r _ triple _ _ processor <<<"${about[$1]}"
	[[ $processor != ARM ]] || triple=arm-linux-androideabi
	shared=$tools/sysroot/usr/lib/$triple/libc++_shared.so
	[[ -e $shared ]]
}

# The unit suite, fptest and the sample items, with the NDK's C++ library and what they
# need of Debian's packages.
build_cxx()
{
	local preset built=$place/$1-cxx prefix=$place/$1-prefix project options
	local headers=$place/headers

	read -r preset _ <<<"${about[$1]}"
	[[ -d $headers ]] || {
		mkdir -- "$headers"
		dpkg --listfiles libfmt-dev libfmt9 libcli11-dev libutfcpp-dev nlohmann-json3-dev |
			tar --create --no-recursion --files-from - 2>/dev/null | tar --extract --directory "$headers"
		# they refuse other word sizes; of these packages, headers alone are used
		find "$headers" -iname '*config*version.cmake' -delete
	}
	quietly tests/android/source expat "$place/expat"
	options=(-DANDROID_ABI="$1" -DANDROID_PLATFORM=android-28 -DANDROID_STL=c++_shared
		-DCMAKE_BUILD_TYPE=Release)
	for project in /usr/src/googletest "$place/expat/expat"; do
		quietly cmake -S "$project" -B "$prefix/build-${project##*/}" "${options[@]}" \
			-DCMAKE_TOOLCHAIN_FILE="$ndk/build/cmake/android.toolchain.cmake" \
			-DCMAKE_INSTALL_PREFIX="$prefix" -DCMAKE_CXX_STANDARD=20 -DEXPAT_SHARED_LIBS=OFF \
			-DEXPAT_BUILD_{DOCS,EXAMPLES,TESTS,TOOLS}=OFF
		# Debian's changes to expat ask for its value, which CMake does not give it
		sed -i 's/^#define XML_DTD$/& 1/' "$prefix/build-${project##*/}"/*_config.h 2>/dev/null || true
		quietly cmake --build "$prefix/build-${project##*/}" --parallel "$(nproc)" --target install
	done
	quietly cmake --preset "$preset" -B "$built" "${options[@]}" \
		-DMINIXML_INCLUDE_DIR="$place/mini-xml-$1" -DMINIXML_LIBRARY="$place/mini-xml-$1/libmxml.so" \
		-DCMAKE_FIND_ROOT_PATH="$prefix;$headers/usr" -DCMAKE_DISABLE_PRECOMPILE_HEADERS=ON \
		-DCMAKE_UNITY_BUILD=ON -DQUILLMARK_BUILD_TOOLS=ON -DQUILLMARK_BUILD_TESTS=ON \
		-Dfmt_DIR="$(dirname -- "$headers"/usr/lib/*/cmake/fmt/fmt-config.cmake)" \
		-Dutf8cpp_DIR="$(dirname -- "$headers"/usr/lib/*/cmake/utf8cpp/utf8cppConfig.cmake)"
	quietly cmake --build "$built" --parallel "$(nproc)" --target unit_tests fptest "${samples[@]}"
	rm -rf -- "$built/programs"
	mkdir -- "$built/programs"
	cp -- "$shared" "$place/$1/programs/"{ps,*.so} "$built/tests/unit/unit_tests" \
		"$built/agent/fptest" "${samples[@]/#/"$built/device/bin/"}" "$built/programs/"
}

# The copy of a /system that ABI $1 can run on.
system_for()
{
	local loader processor path

	read -r _ _ _ loader processor <<<"${about[$1]}"
	for system in "${systems[@]}"; do
		for path in "$system/bin/$loader" "$system/../apex/com.android.runtime/bin/$loader"; do
			readelf --file-header "$path" 2>/dev/null | grep -q "Machine:.* $processor\$" && return
		done
	done
	return 1
}

# Runs the host in directory $1, of ABI $2, on the device.
on_device()
{
	local directory=lib adb=(adb -s "$serial")

	[[ $2 != *64* ]] || directory=lib64
	quietly "${adb[@]}" root && quietly "${adb[@]}" wait-for-device &&
		quietly "${adb[@]}" remount &&
		quietly "${adb[@]}" shell 'rm -rf /data/vorlane
			mkdir -p /data/vorlane /data/local/tmp/quillmark /etc/vorlane/sysparms' &&
		quietly "${adb[@]}" push "$1/ps" /data/local/tmp/quillmark/ &&
		quietly "${adb[@]}" push "$1"/*.so "/system/$directory/" &&
		quietly "${adb[@]}" push "${items[@]/#/$1/}" "$1/scenarios" /system/bin/ &&
		"${adb[@]}" shell "PATH=/data/local/tmp/quillmark:\$PATH; $run" </dev/null
}
