# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
# shellcheck shell=bash
#
# Roots of their own for lab engines, for scripts/test-lab. This machine's apt downloads, by its
# own sources, proxies and keys; what installs has no network.

cache=$(realpath -m -- "${XDG_CACHE_HOME:-${HOME:-/root}/.cache}/quillmark")

# the devices and fptest; what tests run; the engines, and what those fetch tests with
packages=(bubblewrap mksh toybox libmxml1 libexpat1 libfmt9 adb parallel
	openssh-server openssh-client python3-pytest python3-pytest-xdist
	python3-labgrid lava-dispatcher git)

# What these depend on for boards that they boot, flash or draw, half of all packages: to apt
# they are installed already.
left_out=(
	# of the appliance that looks into images of disks
	btrfs-progs cryptsetup-bin curl db-util debootstrap dosfstools exfatprogs extlinux
	f2fs-tools gawk gdisk grub2-common icoutils isc-dhcp-client kpartx ldmtool lsscsi lvm2 lzop
	mdadm mtools netpbm ntfs-3g osinfo-db parted pciutils qemu-system-x86 qemu-utils scrub
	sleuthkit squashfs-tools supermin syslinux uuid-runtime zerofree
	# of containers with devices, of SNMP and of graphs
	bpftool graphviz linux-headers-amd64 python3-bpfcc python3-pysnmp4-mibs
	# of parallel
	libdate-manip-perl sysstat)

list_left_out()
{
	printf 'Package: %s\nStatus: install ok installed\nArchitecture: all\nVersion: 9999
Maintainer: nobody\nDescription: left out\n\n' "${left_out[@]}"
}

# This machine's apt, which takes nothing else for installed than what is left out, and
# downloads to the cache.
apt_here()
{
	quietly apt-get --quiet --yes --no-install-recommends --option APT::Sandbox::User=root \
		--option Dir::State::lists="$cache/lists" --option Dir::Cache="$cache" \
		--option Dir::State::status="$cache/status" --option Debug::NoLocking=true "$@"
}

# Downloads packages "$@" and all they need, a base system's included.
download()
{
	local base

	mkdir -p -- "$cache"/{lists,archives}/partial
	list_left_out >"$cache/status"
	apt_here update
	mapfile -t base < <(apt-cache --option Dir::State::lists="$cache/lists" dumpavail |
		awk '/^Package:/ { name = $2 } /^Priority: required/ { print name }')
	apt_here --download-only install apt "${base[@]}" "$@"
}

# Debian's own root in directory $1, of this machine's release and from its mirror.
bootstrap()
{
	local release mirror

	release=$(. /etc/os-release && echo "${VERSION_CODENAME-}")
	# shellcheck disable=SC2016 # for apt
	mirror=$(apt-get indextargets --format '$(REPO_URI)' 'Created-By: Packages' \
		"Codename: $release" 'Component: main' "Architecture: $(dpkg --print-architecture)" |
		head -n 1)
	[[ -n $mirror ]] || fail "apt has no source for Debian's '$release'"
	quietly debootstrap --variant=minbase --cache-dir="$cache/archives" "$release" "$1" "$mirror"
}

# Runs a program with root $1, without network, and with no process but its own; "${@:2}" are
# options of bwrap, --, the program and its arguments. The virtual device's own /proc can be
# mounted only where the one here has nothing on top, as bwrap's has.
box()
{
	unshare --mount --pid --fork --mount-proc --kill-child \
		bwrap --bind "$1" / --dev /dev --bind /proc /proc --perms 1777 --tmpfs /tmp --tmpfs /run \
		--unshare-net --unshare-ipc --unshare-uts --hostname lab --cap-add ALL \
		--clearenv --setenv PATH /usr/sbin:/usr/bin:/sbin:/bin \
		--setenv HOME /root --setenv LC_ALL C.UTF-8 "${@:2}"
}

# Installs packages "${@:2}" in root $1. None starts a service.
install_in()
{
	local name

	printf '#!/bin/sh\nexit 101\n' >"$1/usr/sbin/policy-rc.d"
	chmod +x "$1/usr/sbin/policy-rc.d"
	echo force-unsafe-io >"$1/etc/dpkg/dpkg.cfg.d/lab"
	{ echo && list_left_out; } >>"$1/var/lib/dpkg/status"
	for name in "${left_out[@]}"; do
		: >"$1/var/lib/dpkg/info/$name.list"
	done
	rm -f -- "$1/etc/apt/sources.list"
	quietly box "$1" --bind "$cache/archives" /var/cache/apt/archives \
		--ro-bind "$cache/lists" /var/lib/apt/lists \
		--ro-bind-try /etc/apt/sources.list /etc/apt/sources.list \
		--ro-bind /etc/apt/sources.list.d /etc/apt/sources.list.d \
		--chdir / --setenv DEBIAN_FRONTEND noninteractive -- \
		apt-get --quiet --yes --no-install-recommends --no-download install "${@:2}"
}

# Makes root $1, with packages "${@:2}" beside those of all, unless it is there.
make_root()
{
	local root=$cache/$1 wanted

	wanted=$(printf '%s\n' "${packages[@]}" "${@:2}" && list_left_out &&
		declare -f bootstrap install_in && cat /etc/os-release)
	mkdir -p -- "$cache"
	exec {making}>"$cache/$1.lock"
	flock "$making"
	if ! cmp --quiet -- - "$root/wanted" <<<"$wanted"; then
		echo "Installing a root for lab engines in $root"
		rm -rf -- "$root"
		download "${packages[@]}" "${@:2}"
		bootstrap "$root"
		install_in "$root" "${packages[@]}" "${@:2}"
		rm -rf -- "$cache/archives"
		cat >"$root/wanted" <<<"$wanted"
	fi
	flock --shared "$making" # as long as this script runs
}

# Of those that really are in directory $1.
count_packages()
{
	dpkg-query --admindir="$1/var/lib/dpkg" --show --showformat='${Version}\n' | grep -cvx 9999
}

# Runs "${@:2}" in the tree, with root $1, which like the tree is read-only.
in_root()
{
	box "$cache/$1" --tmpfs /root --tmpfs /var/tmp --tmpfs /var/lib/lava --bind "$PWD" "$PWD" \
		--chdir "$PWD" --remount-ro / --remount-ro "$PWD" -- "${@:2}"
}

# As in_root, but what is written to the root is so in memory, and lost with the end.
in_scratch()
{
	export -f box
	export cache
	# shellcheck disable=SC2016 # for that bash
	unshare --mount bash -euc 'mount -t tmpfs lab /mnt
		mkdir /mnt/upper /mnt/work /mnt/root
		mount -t overlay lab -o "lowerdir=$cache/$0,upperdir=/mnt/upper,workdir=/mnt/work" /mnt/root
		box /mnt/root --bind "$PWD" "$PWD" --chdir "$PWD" --remount-ro "$PWD" -- "$@"' "$@"
}
