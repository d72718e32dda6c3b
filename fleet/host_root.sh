#!/bin/sh
# Becomes one host of a fleet: host_root.sh ROOT FURNITURE NAME
#
# Called by fleet/hosts as the first process of new mount, process, IPC and host name namespaces.
# Makes the host's root below the empty directory ROOT, in memory: the files of FURNITURE, the
# machine's /usr under a layer of the host's own, and nothing else of the machine. Then runs sshd.
# All of it is gone when this process ends.
set -eu
root=$1 furniture=$2 name=$3

hostname "$name"
mount -t tmpfs -o mode=0755 host "$root"
cp -R --preserve=mode "$furniture/." "$root"
cd "$root"
mkdir -m 0755 dev home media mnt opt proc run srv sys usr var var/cache var/lib var/log .usr .work
mkdir -m 1777 tmp var/tmp
mkdir -m 0700 run/sshd
for link in bin lib lib32 lib64 libx32 sbin; do
    [ ! -L "/$link" ] || cp -P "/$link" .
done
ln -s ../run var/run

mount -t overlay -o "lowerdir=/usr,upperdir=$root/.usr,workdir=$root/.work" usr usr
mount -t proc proc proc
mount -t tmpfs -o mode=0755 dev dev
for device in full null random tty urandom zero; do
    : >"dev/$device"
    mount --bind "/dev/$device" "dev/$device"
done
ln -s /proc/self/fd dev/fd
mkdir dev/pts dev/shm
chmod 1777 dev/shm
mount -t devpts -o newinstance,ptmxmode=0666,mode=0620 devpts dev/pts
ln -s pts/ptmx dev/ptmx
mkdir home/ann
chown 1000:1000 home/ann

pivot_root . mnt
cd /
umount -l mnt

# sshd may be ended and started again while the host goes on. Processes that lose their parent become
# children of this shell, which collects them.
exec >/var/log/host.log 2>&1
/usr/sbin/sshd -D -E /var/log/sshd.log &
while :; do
    sleep 3600 &
    wait $! || :
done
