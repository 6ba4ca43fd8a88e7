"""A stick that is pulled out: a device that is gone is not an empty device."""
import os
import pathlib

from ferrix import machine

HERE = pathlib.Path(__file__).resolve().parents[1]


def pull(install, scratch, fs):
    script = (f"exec python3 -u {HERE}/pull_guest.py --install {install} --fs {fs} "
              "--stick $STICK\n")
    # The kernel is fetched once; the build folder keeps it for the next run.
    cache = os.path.join(HERE.parents[1], "build", "pull-kernel")
    assert machine.run(script, fs, cache) == 0


def test_a_vfat_stick_is_pulled(install, scratch):
    """vfat: a pulled stick lists as empty with success; not one file of the copy goes."""
    pull(install, scratch, "vfat")


def test_an_exfat_stick_is_pulled(install, scratch):
    """exFAT: a pulled stick answers I/O errors; not one file of the copy goes."""
    pull(install, scratch, "exfat")


def test_an_ext4_stick_is_pulled(install, scratch):
    """ext4: a pulled stick shows old cached names; not one file of the copy goes."""
    pull(install, scratch, "ext4")


for scenario in (test_a_vfat_stick_is_pulled, test_an_exfat_stick_is_pulled,
                 test_an_ext4_stick_is_pulled):
    scenario.machine = scenario.long = True
