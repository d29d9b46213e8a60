#!/bin/sh
# First process of a sandbox: mounts what the daemon needs over the sandbox's root, then runs the daemon in it.
# Arguments: ROOT BINARY COMMAND…; LMX_MOUNTS holds more mounts, one a line: "tmpfs SIZE PATH" or "ro PATH".
set -eu
root=$1
binary=$2
shift 2

bind() { mount --bind "$1" "$root$2"; }
read_only() { mount -o bind,ro "$1" "$root$2" 2>/dev/null || bind "$1" "$2"; }

for entry in /usr/*; do
  case $entry in
    /usr/bin) read_only /usr/bin /.hostbin ;;  # its place is taken by links, so that a tool of ours can stand there
    *) [ -L "$entry" ] || read_only "$entry" "$entry" ;;
  esac
done
read_only /etc /etc
for device in null zero full random urandom; do bind "/dev/$device" "/dev/$device"; done
mount -t tmpfs -o mode=1777 shm "$root/dev/shm"
mount -t tmpfs -o mode=1777 tmp "$root/tmp"
mount -t proc proc "$root/proc"
bind "$binary" /opt/lmxagentd
printf '%s\n' "${LMX_MOUNTS:-}" | while read -r kind first second; do
  case $kind in
    tmpfs) mount -t tmpfs -o "size=$first" repository "$root$second" ;;
    ro) mount --bind "$root$first" "$root$first" && mount -o remount,bind,ro "$root$first" ;;
  esac
done
ip link set lo up
unset LMX_MOUNTS
# Held back here, the daemon finds a server that was started in its network meanwhile.
: >"$root/../ready"
while [ -e "$root/../held" ]; do sleep 0.01; done
# The shell stays as process 1 and reaps what the daemon leaves behind; its status is the daemon's.
exec chroot "$root" /bin/sh -c 'cd /; "$@"; exit $?' sandbox "$@"
