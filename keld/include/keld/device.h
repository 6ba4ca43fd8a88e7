/* Plugged-in storage devices. Device names are kernel names, without "/dev/": "sdb1", "mmcblk0p1".
 * Threads: any. */
#ifndef KELD_DEVICE_H
#define KELD_DEVICE_H

#ifdef __cplusplus
extern "C" {
#endif

#include <stddef.h>

/* The name of the whole disk that a partition belongs to: "sdb1" gives "sdb", "mmcblk0p1"
 * "mmcblk0", "nvme0n1p2" "nvme0n1", "loop0p1" and "loop0" "loop0". The device need not be there.
 * Returns 0; negative for a name that is empty or holds "/", or when the buffer is too small. */
int DiskPartitionNumRemove(const char* partition, char* disk, size_t size);

/* One partition of a disk. Positions and sizes are in bytes. */
typedef struct DiskPartition {
    char name[32]; /* "sdb1"; the disk's own name when the disk has no partition table */
    unsigned long long start;
    unsigned long long size;
} DiskPartition;

/* The partitions of the disk `disk` ("sdb"). A disk without a partition table has one, the whole of
 * it. Fills at most `capacity` entries of `layout`, which may be null when `capacity` is 0.
 * Returns the number of partitions, which may be greater than `capacity`; negative when there is no
 * such disk. */
int DiskPartitionsLayoutGet(const char* disk, DiskPartition* layout, int capacity);

/* What is known of a disk and its place on the box. */
typedef struct KELDUSBDevInfo {
    char name[32];    /* the disk, "sdb" */
    char port[64];    /* the USB port that it hangs on, "1-1.2"; empty when it is not on USB */
    int is_usb;       /* 1 when it is reached over USB */
    int is_mmc;       /* 1 for an SD or MMC card on a host controller of its own */
    int is_removable; /* 1 when it counts as plugged-in storage */
} KELDUSBDevInfo;

/* Fills `info` for the disk `name`. Returns 0; negative when there is no such disk. */
int KELDUSBDevGetInfo(const char* name, KELDUSBDevInfo* info);

/* Locations that KELDUSBGetLocation tells apart; any other value from 0 on is another port. */
enum { KELD_USB_LOCATION_OTHER = 0, KELD_USB_LOCATION_SD_SLOT = 98, KELD_USB_LOCATION_FRONT = 99 };
/* Where on the box the disk is plugged in: 99 a front USB port, 98 the SD slot, another value from
 * 0 on any other place; negative on failure. */
int KELDUSBGetLocation(const KELDUSBDevInfo* info);

/* Takes the disk `name` out of service so that it can be unplugged: flushes and unmounts each file
 * system on it and on its partitions, then powers it off where the kernel can. `flags` is 4.
 * Returns 0 when every file system was flushed and unmounted. Negative when one is busy or a flush
 * failed (then nothing that is still in use has been unmounted and the disk keeps its power) or
 * when there is no such disk. */
int KELDExtStgPullOut(const char* name, int flags);

/* A device that is gone is not an empty device: the folder of a pulled stick may still list, empty
 * and with success, and may still stand in the mount table. These two calls ask for the device
 * itself. */

/* Room that any identity fits in. */
#define KELD_DEV_IDENTITY_SIZE 512

/* Writes an opaque text that names the very device and file system that hold `mount_path` now: a
 * share's root or a mount point, or a folder below one. The text is good until the next restart of
 * the machine. Returns 0; negative when the path does not answer or the buffer is too small. */
int KELDDevIdentityGet(const char* mount_path, char* identity, size_t size);

/* Whether the device and file system of `identity` still stand behind `mount_path`: 1 when the path
 * answers on the same file system and its block device still exists; 0 when it is gone, or another
 * one is there; negative when that cannot be told (bad identity, no memory). */
int KELDDevIsPresent(const char* mount_path, const char* identity);

#ifdef __cplusplus
}
#endif
#endif
