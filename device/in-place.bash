# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

# shellcheck shell=bash disable=SC2154
#
# The in-place way of device/run, which sources this file: the root of this
# container becomes the device for the time of one run and is put back after
# it. Takes fail, device, supervise, signals, mksh, program, told, data, out and
# vendor from there.

# What an interrupted run leaves to be undone by the next one: run (its mark),
# made (the directories it made, in order) and sh (the former /bin/sh). On the
# disk that holds /bin, so that a restarted container has both or neither.
keep=/var/lib/quillmark-device

# ---- undoing -----------------------------------------------------------------

# The processes left behind by the run with mark $1: those that carry the mark in
# their environment, and those started from /system/bin by their full name.
left_behind()
{
	local path name

	grep -lzsxF "QUILLMARK_DEVICE_RUN=$1" /proc/[0-9]*/environ | cut -d/ -f3
	for path in /proc/[0-9]*; do
		name=''
		{ IFS= read -r -d '' name <"$path/cmdline"; } 2>/dev/null
		[[ $name = /system/bin/* ]] && echo "${path##*/}"
	done
}

# Asks them to end, waits for a second, then insists.
stop_left_behind()
{
	local pids tries

	mapfile -t pids < <(left_behind "$1")
	((${#pids[@]} > 0)) && kill -TERM "${pids[@]}" 2>/dev/null
	for ((tries = 0; tries < 50 && ${#pids[@]} > 0; tries++)); do
		sleep 0.02
		mapfile -t pids < <(left_behind "$1")
	done
	((${#pids[@]} > 0)) && kill -KILL "${pids[@]}" 2>/dev/null
}

put_shell_back()
{
	[[ -e $keep/sh || -L $keep/sh ]] || return 0
	cp -P --preserve=all "$keep/sh" /bin/.sh-quillmark && mv -fT /bin/.sh-quillmark /bin/sh
}

# Undoes what this run, or an interrupted one before it, has done.
put_back()
{
	local path mark='' made=() trees=() empty=()

	[[ -d $keep ]] || return
	trap '' HUP INT QUIT TERM
	read -r mark 2>/dev/null <"$keep/run"
	stop_left_behind "$mark"
	if ! put_shell_back; then
		printf 'device/run: in place: /bin/sh cannot be put back; it is kept in %s\n' "$keep" >&2
		return
	fi
	mapfile -t made 2>/dev/null <"$keep/made"
	for path in "${made[@]}"; do
		case $path in
		/system/bin | /dev/shm/quillmark-* | /data/vorlane | /data/local/tmp | /etc/vorlane) trees+=("$path") ;;
		*) empty=("$path" "${empty[@]}") ;;
		esac
	done
	rm -rf -- "${trees[@]}"
	((${#empty[@]} > 0)) && rmdir -- "${empty[@]}" 2>/dev/null
	rm -rf -- "$keep"
}

# ---- making the device -------------------------------------------------------

take_the_container()
{
	exec {lock}</
	if ! flock --nonblock "$lock"; then
		echo 'device/run: in place: waiting for the run that has this container' >&2
		flock "$lock"
	fi
}

# Notes paths before they are made, so that an interruption leaves none unnoted.
make_directories()
{
	local path missing=()

	for path in "$@"; do
		[[ -d $path ]] || missing+=("$path")
	done
	printf '%s\n' "${missing[@]}" >>"$keep/made" && mkdir -- "${missing[@]}"
}

# Links alone, in memory if there is some: a disk takes its time for hundreds. One
# process makes them all; with ln it would be one for each.
make_system_bin()
{
	local name links=() memory=/dev/shm/quillmark-$run_mark

	if [[ -w /dev/shm ]]; then
		make_directories "$memory" && echo /system/bin >>"$keep/made" &&
			links=("$memory" /system/bin) || return
	else
		make_directories /system/bin || return
	fi
	links+=("$device/guard" /system/bin/sh)

	for name in "${!program[@]}"; do
		[[ $name = sh ]] || links+=("${program[$name]}" "/system/bin/$name")
	done
	perl -e 'while (@ARGV) { symlink(shift, shift) or die "/system/bin: $!\n" }' -- "${links[@]}"
}

point_shell_at_mksh()
{
	cp -P --preserve=all /bin/sh "$keep/sh-new" && mv -T "$keep/sh-new" "$keep/sh" &&
		ln -sfT -- "$mksh" /bin/.sh-quillmark && mv -fT /bin/.sh-quillmark /bin/sh
}

lay_out_container()
{
	local directories=(/system /data /data/local /data/local/tmp /etc/vorlane /etc/vorlane/sysparms)

	[[ -n $data ]] || directories+=(/data/vorlane)
	mkdir -- "$keep" && echo "$run_mark" >"$keep/run" &&
		make_directories "${directories[@]}" || return
	if [[ -n $data ]]; then
		echo /data/vorlane >>"$keep/made" && ln -s -- "$data" /data/vorlane || return
	fi
	make_system_bin && point_shell_at_mksh
}

# Waits for the supervisor, which is asked by every signal that comes here.
wait_for_command()
{
	local pid=$1 signal status=0 gate asked=()

	for signal in ${signals//,/ }; do
		# shellcheck disable=SC2064
		trap "asked+=(-$signal)" "$signal"
	done
	# not by wait alone: interrupted again and again, it may lose the status
	exec {gate}<> <(:)
	while kill -0 "$pid" 2>/dev/null; do
		# a bash that is not yet the supervisor may lose what it is sent
		while [[ -n ${asked[0]-} && /proc/$pid/exe -ef $supervise ]]; do
			kill "${asked[0]}" "$pid" 2>/dev/null || true
			asked=("${asked[@]:1}")
		done
		read -r -t 0.01 -u "$gate" || true
	done
	wait "$pid" || status=$?
	exit "$status"
}

be_the_device()
{
	local path name complaint signal run_mark="$$-$EPOCHREALTIME"

	take_the_container
	put_back
	for path in /system/bin /data/vorlane /etc/vorlane; do
		[[ -e $path || -L $path ]] && fail "in place: $path exists already; move it away first"
	done

	trap put_back EXIT
	for signal in ${signals//,/ }; do
		# shellcheck disable=SC2064
		trap "exit $((128 + signal))" "$signal"
	done
	complaint=$(lay_out_container 2>&1) || fail "in place: ${complaint%%$'\n'*}"

	for name in "${!told[@]}"; do
		export "$name=${told[$name]}"
	done
	[[ -z $out ]] || cd -- "$out" || exit 125
	PATH=/system/bin TMPDIR=/tmp QUILLMARK_DEVICE=in-place QUILLMARK_DEVICE_RUN=$run_mark \
		"$supervise" here $$ "$signals" "$supervise" become 0 "$signals" \
		"$mksh" "$device/start" "$vendor" "$scripts" "$@" <&0 {lock}<&- &
	wait_for_command $!
}
