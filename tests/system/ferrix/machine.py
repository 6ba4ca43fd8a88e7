"""A small emulated machine with a USB stick that can be pulled out while it is mounted.

Debian's own kernel runs under software emulation with this machine's root folder mounted read-only,
so every program here runs there too. A script of ours runs in it as root, with the stick's device
in $STICK (formatted, not mounted) and a tmpfs at /mnt. A line YANK on its output pulls the
stick, a line PLUG puts it back.
"""
import fcntl
import glob
import os
import re
import shutil
import socket
import subprocess
import tempfile
import time

MODULES = ("crc32c_generic libcrc32c virtio_pci 9p 9pnet_virtio xhci-pci usb-storage uas sd_mod ext4"
           " vfat exfat nls_cp437 nls_ascii nls_utf8 loop overlay fuse").split()
FORMAT = {"vfat": ["mkfs.vfat", "-F", "32"], "exfat": ["mkfs.exfat"], "ext4": ["mkfs.ext4", "-q", "-F"]}
INIT = """#!/bin/busybox sh
/bin/busybox --install -s /bin
mkdir -p /proc /sys /dev /sbin /host
ln -s /bin/busybox /sbin/modprobe
export PATH=/bin
mount -t proc p /proc
mount -t sysfs s /sys
mount -t devtmpfs d /dev
for m in {modules}; do modprobe $m 2>/dev/null; done
mount -t 9p -o trans=virtio,version=9p2000.L,msize=262144,ro host /host || echo NO ROOT
for k in proc sys dev; do mount --bind /$k /host/$k; done
mount -t tmpfs t /host/mnt
cp /job /host/mnt/job
for i in 1 2 3 4 5 6 7 8 9; do [ -b /dev/sda ] && break; sleep 1; done
chroot /host /bin/sh -c 'export PATH=/usr/sbin:/usr/bin:/sbin:/bin STICK=/dev/sda; . /mnt/job'
echo "EXIT $?"
poweroff -f
"""


def _kernel(cache):
    """Fetches and unpacks Debian's kernel package, once; it is not installed."""
    os.makedirs(cache, exist_ok=True)
    with open(cache + "/lock", "w", encoding="ascii") as lock:
        fcntl.flock(lock, fcntl.LOCK_EX)
        return _fetch_kernel(cache)


def _fetch_kernel(cache):
    if not glob.glob(cache + "/k/boot/vmlinuz-*"):
        depends = subprocess.run(["apt-cache", "depends", "linux-image-amd64"], check=True,
                                 stdout=subprocess.PIPE, text=True).stdout
        package = re.search(r"Depends: (linux-image-\S+)", depends)[1]
        subprocess.run(["apt-get", "-q", "download", package], cwd=cache, check=True,
                       stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
        subprocess.run(["dpkg", "-x", glob.glob(cache + "/*.deb")[0], cache + "/k"], check=True)
    image = glob.glob(cache + "/k/boot/vmlinuz-*")[0]
    version = image.split("vmlinuz-")[1]
    subprocess.run(["depmod", "-b", cache + "/k", version], check=True)
    return image, version


def _initrd(cache, version, script, folder):
    root = tempfile.mkdtemp(dir=folder)
    modules = f"{root}/lib/modules/{version}"
    os.makedirs(root + "/bin")
    os.makedirs(modules)
    shutil.copy(shutil.which("busybox"), root + "/bin/busybox")
    for module in MODULES:
        needed = subprocess.run(["modprobe", "-d", cache + "/k", "-S", version, "--show-depends",
                                 module], stdout=subprocess.PIPE, stderr=subprocess.DEVNULL,
                                text=True, check=False).stdout
        for path in re.findall(r"insmod (\S+)", needed):
            target = modules + path.split("/lib/modules/" + version)[1]
            os.makedirs(os.path.dirname(target), exist_ok=True)
            shutil.copy(path, target)
    for path in glob.glob(f"{cache}/k/lib/modules/{version}/modules.[bo]*"):
        shutil.copy(path, modules)
    subprocess.run(["depmod", "-b", root, version], check=True)
    for name, text in (("job", script), ("init", INIT.format(modules=" ".join(MODULES)))):
        with open(f"{root}/{name}", "w", encoding="ascii") as out:
            out.write(text)
    os.chmod(root + "/init", 0o755)
    image = f"{folder}/initrd.gz"
    subprocess.run("find . | cpio -o -H newc 2>/dev/null | gzip -1 > " + image, shell=True,
                   cwd=root, check=True)
    return image


def run(script, fs, cache, stick_mb=256, timeout=600, say=print):
    """Runs the shell text `script` in the machine; returns its exit status."""
    kernel, version = _kernel(cache)
    with tempfile.TemporaryDirectory(prefix="ferrix-machine-") as folder:
        initrd = _initrd(cache, version, script, folder)
        stick, monitor = folder + "/stick.img", folder + "/monitor"
        with open(stick, "wb") as out:
            out.truncate(stick_mb << 20)
        subprocess.run([*FORMAT[fs], stick], check=True, stdout=subprocess.DEVNULL)
        machine = subprocess.Popen(
            ["timeout", str(timeout), "qemu-system-x86_64", "-accel", "tcg", "-m", "768",
             "-display", "none", "-serial", "stdio", "-net", "none", "-no-reboot",
             "-kernel", kernel, "-initrd", initrd, "-append", "console=ttyS0 panic=-1 quiet",
             "-device", "qemu-xhci,id=xhci", "-virtfs",
             "local,path=/,mount_tag=host,security_model=none,readonly=on,multidevs=remap",
             "-blockdev", f"driver=file,filename={stick},node-name=stick",
             "-device", "usb-storage,bus=xhci.0,drive=stick,id=u0",
             "-monitor", f"unix:{monitor},server,nowait"],
            stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.STDOUT)

        def tell(command):
            with socket.socket(socket.AF_UNIX) as sock:
                sock.connect(monitor)
                sock.recv(4096)
                sock.sendall((command + "\n").encode())
                time.sleep(0.3)

        plugged, status = 0, 1
        for line in machine.stdout:
            line = line.decode(errors="backslashreplace").rstrip()
            say(line)
            if line.strip() == "YANK":
                tell(f"device_del u{plugged}")
            if line.strip() == "PLUG":
                plugged += 1
                tell(f"device_add usb-storage,bus=xhci.0,drive=stick,id=u{plugged}")
            if match := re.match(r"EXIT (\d+)", line):
                status = int(match[1])
        machine.wait()
        return status
