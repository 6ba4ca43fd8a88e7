"""The process: start, stop, pid file, status, who may give orders."""
import os
import signal
import socket
import stat
import subprocess
import time

from ferrix import wire
from ferrix.box import PACKAGE, sh, wait_until


def mode(path):
    return stat.S_IMODE(os.lstat(path).st_mode)


def test_start_answer_and_stop(box):
    """The daemon starts, answers, writes its state, and ends on SIGTERM with nothing left behind."""
    box.start()
    assert box.log.expect("link daemon, version: 0037")
    assert box.log.expect("Link Daemon")
    with open(f"{PACKAGE}/etc/status", encoding="ascii") as status:
        assert 'state="4"' in status.read()
    assert mode("/run/ferrixd.pid") == 0o644
    assert mode(f"{PACKAGE}/etc/status.lock") == 0o440
    box.stop(20)
    assert not os.path.exists("/run/ferrixd.pid")
    assert not os.path.exists("/tmp/ferrix-socket")
    wait_until(lambda: box.log.has("Daemon End ..."), 10)
    assert box.log.expect("Unlink Daemon")


def test_unknown_names_are_acknowledged(box):
    """Unknown actions and hooks, and requests that are no maps, are answered with the bare ack."""
    box.start()
    for message in ({"action": "no_such"}, {"notify": "post_mount"}, {}, [1, 2], None, "text", 7,
                    {"notify": "no_such", "type": "share_hook"},
                    {"notify": "post_mount", "type": "other_hook"}, {"action": "link"}):
        assert wire.request(message) == {"ack": "ok"}, message
    with wire.connect() as sock:
        sock.sendall(wire.encode({"action": "list_entry", "need_ack": False}))
        assert sock.recv(1) == b""


def test_stop_by_a_client_is_not_answered(box):
    """The action "stop" ends the daemon; its client only sees the connection close."""
    box.start()
    assert wire.request({"action": "stop", "need_ack": True}) is None
    wait_until(lambda: not box.is_running(), 30)
    assert not os.path.exists("/run/ferrixd.pid")


def test_second_start_leaves_the_first_alone(box):
    """A second start ends at once and keeps the pid file; a stale pid file is no obstacle."""
    box.start()
    first = box.daemon_pid
    done = subprocess.run([f"{PACKAGE}/target/sbin/ferrixd"], check=False, timeout=30)
    assert done.returncode == 0
    assert box.log.expect(f"daemon is already running (pid = {first})")
    with open("/run/ferrixd.pid", encoding="ascii") as pid_file:
        assert int(pid_file.read()) == first
    assert box.ask("list_task")["task_list"] == []
    box.kill()
    assert os.path.exists("/run/ferrixd.pid") and os.path.exists("/tmp/ferrix-socket")
    box.start()
    assert box.daemon_pid != first


def test_signals_change_only_the_log_level(box):
    """SIGUSR1, SIGUSR2 and a broken pipe do not end the daemon; SIGINT does."""
    box.start()
    for number in (signal.SIGUSR1, signal.SIGUSR2, signal.SIGUSR2, signal.SIGUSR2, signal.SIGUSR2,
                   signal.SIGUSR2, signal.SIGPIPE):
        os.kill(box.daemon_pid, number)
        time.sleep(0.05)
    assert box.ask("list_task")["ack"] == "ok"
    os.kill(box.daemon_pid, signal.SIGINT)
    wait_until(lambda: not box.is_running(), 20)


def test_only_root_gives_orders(box):
    """Another user's connection is closed without an answer, and nothing is done for it."""
    box.start()
    child = os.fork()
    if child == 0:
        os.setgid(65534)
        os.setuid(65534)
        try:
            with socket.socket(socket.AF_UNIX) as sock:
                sock.settimeout(30)
                sock.connect(wire.SOCKET)
                try:
                    sock.sendall(wire.encode({"action": "stop"}))
                    os._exit(1 if sock.recv(100) else 0)
                except (ConnectionResetError, BrokenPipeError):
                    os._exit(0)
        finally:
            os._exit(2)
    assert os.waitstatus_to_exitcode(os.waitpid(child, 0)[1]) == 0
    assert box.ask("list_task")["ack"] == "ok" and box.is_running()


def test_files_of_the_daemon_cannot_be_written_by_others(box):
    """In spite of the daemon's umask of 0, its files are writable by their owner alone."""
    box.add_share("photos")
    stick = box.add_device("stick")
    stick.mount()
    box.start()
    task = box.add_mirror(stick)
    box.ask("list_task")
    for top in ("/volume1/@Ferrix", f"{PACKAGE}/etc", "/var/lib/keld", "/etc/cron.d", "/run"):
        for folder, _, files in os.walk(top):
            for name in files:
                path = os.path.join(folder, name)
                assert mode(path) & 0o022 == 0, f"{path} has mode {mode(path):o}"
    assert os.path.exists(f"/volume1/@Ferrix/task/{task}/user.config")


def test_an_unusable_repository_ends_the_start(box):
    """No repository folder, or a file that is no database: the daemon ends and says why."""
    os.rename("/volume1/@Ferrix", "/volume1/away")
    box.start(wait=False)
    wait_until(lambda: box.log.has("Daemon End ..."), 60)
    assert os.wait()[1] == 0, "the daemon crashed at its end"
    assert box.log.expect("Failed to init task db at '/volume1/@Ferrix/db/task-db.sqlite'")
    assert box.log.expect("Failed to link daemon.")
    assert not os.path.exists("/run/ferrixd.pid")
    os.rename("/volume1/away", "/volume1/@Ferrix")
    with open("/volume1/@Ferrix/db/task-db.sqlite", "wb") as bad:
        bad.write(b"this is no database, and it is long enough to be looked at " * 100)
    mark = box.log.mark()
    box.start(wait=False)
    wait_until(lambda: box.log.has("Daemon End ...", mark), 60)
    assert os.wait()[1] == 0, "the daemon crashed at its end"
    assert box.log.expect("Failed to create task db table at", mark)
    with open("/volume1/@Ferrix/db/task-db.sqlite", "rb") as bad:
        assert bad.read(4) == b"this"


def test_a_start_that_fails_late_ends_too(box):
    """No place for the status, or for the socket: the daemon ends, says why and leaves no pid file."""
    for path, message in ((f"{PACKAGE}/etc/status.lock", "SetServiceStatus() failed"),
                          ("/tmp/ferrix-socket", "Failed to RecieveFromIPC.")):
        if os.path.exists(path):
            os.unlink(path)
        os.makedirs(f"{path}/in-the-way")
        mark = box.log.mark()
        box.start(wait=False)
        wait_until(lambda m=mark: box.log.has("Daemon End ...", m), 60)
        assert os.wait()[1] == 0, "the daemon crashed at its end"
        assert box.log.expect(message, mark)
        assert not os.path.exists("/run/ferrixd.pid")
        os.rmdir(f"{path}/in-the-way")
        os.rmdir(path)
    assert box.log.expect("failed to listen on port domain socket '/tmp/ferrix-socket'")


def test_what_is_asked_without_an_answer_is_done(box):
    """With "need_ack" false the connection closes without a word, when the work is done."""
    box.add_share("photos")
    stick = box.add_device("stick")
    box.start()
    stick.plug()
    task_id = box.add_mirror(stick)
    with wire.connect() as sock:
        sock.sendall(wire.encode({"action": "remove_task", "task_id": task_id, "need_ack": False}))
        assert sock.recv(1) == b""
    assert not os.path.exists(f"/volume1/@Ferrix/task/{task_id}")
    assert box.task(task_id) is None


def test_a_log_daemon_that_hangs_does_not_hold_the_daemon_up(box):
    """With a log daemon that takes no more lines, commands are still answered."""
    box.start()
    os.unlink("/dev/log")
    deaf = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
    deaf.bind("/dev/log")
    box.stop()
    box.start()
    for _ in range(20):
        assert box.ask("list_task")["ack"] == "ok"
    box.stop()
    deaf.close()


def test_two_thousand_open_descriptors_are_closed_at_the_start(box):
    """Descriptors that the starter leaves open do not stay open in the daemon."""
    sh("true")
    handles = [os.open("/dev/null", os.O_RDONLY) for _ in range(200)]
    for handle in handles:
        os.set_inheritable(handle, True)
    program = f"{PACKAGE}/target/sbin/ferrixd"
    subprocess.run([program], check=True, close_fds=False)
    for handle in handles:
        os.close(handle)
    box.start(wait=True)
    count = len(os.listdir(f"/proc/{box.daemon_pid}/fd"))
    assert count < 30, count
