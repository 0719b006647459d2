# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
# shellcheck shell=bash disable=SC2154,SC2004 # what it takes is from there
#
# The way of --system: run sources this file, to have a copy of a device's /system in
# the box. Takes fail, tool, add_users_programs, system, bin, build, box and program from
# there, and sets emulated.

# What is beside the copy as it was beside the device's /system: its C library, from
# Android 10 on.
apex=${system%/*}/apex
[[ -d $apex ]] || apex=''

# DIRECTORY/NAME below /system -> what its link points to
declare -A library=()

# How ELF file $1 is made: its class, lib or lib64, and its processor; nothing otherwise.
elf()
{
	local bytes

	class='' processor=''
	read -r -a bytes < <(od -An -v -tu1 -w20 -N20 -- "$1" 2>/dev/null)
	[[ ${bytes[*]:0:4} = '127 69 76 70' ]] || return
	class=lib
	((bytes[4] == 1)) || class=lib64
	case ${bytes[18]} in
	3) processor=i386 ;;
	40) processor=arm ;;
	62) processor=x86_64 ;;
	183) processor=aarch64 ;;
	esac
}

# Where file $1 of the device is in the copy.
in_copy()
{
	local path=$1 target tries

	for ((tries = 0; tries < 9; tries++)); do
		case $path in
		/system/*) path=$system/${path#/system/} ;;
		/apex/*) path=$apex/${path#/apex/} ;;
		esac
		target=$(readlink -- "$path") || break
		[[ $target = /* ]] || target=${path%/*}/$target
		path=$target
	done
	found=$path
	[[ -f $path ]]
}

list_systems_programs()
{
	local path directory missing=()
	local -A users=()

	[[ -z $bin ]] || add_users_programs
	[[ -d $system/bin ]] || fail "--system $system: no bin in it: not a copy of a device's /system"
	for path in "$system"/bin/*; do
		program[${path##*/}]=$path
	done
	for path in "$system"/lib/* "$system"/lib64/*; do
		directory=${path%/*}
		[[ -e $path || -L $path ]] && library[${directory##*/}/${path##*/}]=$path
	done
	# it knows what the library did, whatever the device; items come from the copy and --bin
	[[ -n ${program[fptest]-} || ! -x $build/agent/fptest ]] || program[fptest]=$build/agent/fptest
	for path in "${!users[@]}"; do
		program[$path]=${users[$path]}
	done
	for path in "${bin:-/dev/null}"/*.so; do
		elf "$path" && library[$class/${path##*/}]=$path
	done

	if ! in_copy /system/bin/sh || ! elf "$found" || [[ -z $processor ]]; then
		fail "--system $system: bin/sh is no program of a device: copy all of /system by adb pull"
	fi
	directory=$class path=linker${class#lib}
	in_copy "/system/bin/$path" || missing+=("bin/$path, which starts its programs")
	in_copy "/system/$directory/libc.so" || missing+=("$directory/libc.so, its C library")
	((${#missing[@]} == 0)) || [[ -n $apex ]] ||
		missing+=("apex beside it: from Android 10 on, adb pull /apex/com.android.runtime \
${system%/*}/apex/com.android.runtime")
	for path in ps grep; do
		[[ -n ${program[$path]-} ]] ||
			missing+=("bin/$path, which the library runs; --bin may have one")
	done
	((${#missing[@]} == 0)) || fail "${missing[@]/#/"--system $system: lacks "}"
	find_emulator
}

# Has the kernel give the programs of another processor to qemu, for the box alone.
find_emulator()
{
	local complaint

	[[ $processor = @(arm|aarch64) && $HOSTTYPE != @(arm*|aarch64) ]] || return 0
	[[ ! -e /proc/sys/fs/binfmt_misc/qemu-$processor ]] || return 0
	tool qemu-aarch64 qemu-user
	emulated=(unshare --user --map-root-user --mount "$BASH" -p "$device/emulate" "${found%/*}")
	complaint=$(setsid -w "${emulated[@]}" true 2>&1 </dev/null) || fail "--system $system: its \
programs are for $processor, and Linux before 6.7 gives those to an emulator for all of the \
machine alone: as root, apt-get install qemu-user-binfmt (${complaint%%$'\n'*})"
}

# The copy in the box: /system, and what is beside it.
lay_out_system()
{
	local path name

	show "$system"
	for path in "$system"/*; do
		name=${path##*/}
		case $name in
		bin | lib | lib64) ;;
		*) [[ -d $path ]] && box+=(--ro-bind "$path" "/system/$name") ;;
		esac
	done
	for name in "${!library[@]}"; do
		box+=(--symlink "${library[$name]}" "/system/$name")
	done
	[[ -z $apex ]] || box+=(--ro-bind "$apex" /apex)
	box+=(--setenv ANDROID_ROOT /system --setenv ANDROID_DATA /data)
}
