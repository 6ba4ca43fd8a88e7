"""Bytes on the socket that no honest client sends: each is refused, and the daemon goes on."""
import random
import socket
import time

from ferrix import wire

ACK = wire.encode({"ack": "ok"})


def alive():
    assert wire.request({"action": "no_such"}) == {"ack": "ok"}


def test_garbage_and_truncated_values(box):
    """Random bytes, unknown tags, wide integers, and a request cut at every byte."""
    box.start()
    rng = random.Random(1)
    for _ in range(100):
        wire.send_raw(rng.randbytes(rng.randrange(1, 300)))
    for data in (b"\x40", b"\x7f", b"\x00\x01", b"\x01\x09" + bytes(9), b"\x42\x01\x01\x01\x40",
                 b"\x30" + bytes(8), b"\x41\x7f"):
        assert wire.send_raw(data) == b"", data
    message = wire.encode({"action": "no_such", "list": [1, {"a": "b"}, None, -1], "z": 1 << 40})
    for cut in range(len(message)):
        assert wire.send_raw(message[:cut]) == b"", cut
    assert wire.send_raw(message) == ACK
    assert box.log.expect("Failed to recieve message from channel.")
    alive()


def test_a_million_nested_arrays(box):
    """A million nested arrays are decoded, printed and destroyed without a stack overflow."""
    box.start()
    depth = 1_000_000
    assert wire.send_raw(b"\x41" * depth + b"\x40" * depth, timeout=300) == ACK
    assert wire.send_raw(b"\x42\x10\x00\x01a" * depth, timeout=300) == b""
    alive()


def test_long_strings_and_many_members(box):
    """Strings of 65,535 bytes and names of any bytes pass unharmed."""
    box.start()
    big = bytes(range(1, 256)) * 257
    message = {"action": "get_filter_setting", "task_id": 1, "text": big}
    assert wire.request(message)["error_code"] == 11
    assert wire.request({"action": "x", "list": [big[:65535]] * 50}) == {"ack": "ok"}
    alive()


def test_clients_that_hang_up_or_never_read(box):
    """A client that goes in the middle, one that never reads, and one that is slow."""
    box.start()
    for data in (b"\x42\x10", b"\x10\x40\x00" + bytes(100)):
        with wire.connect() as sock:
            sock.sendall(data)
    with wire.connect() as sock:
        sock.sendall(wire.encode({"action": "list_task"}))
        sock.close()
    silent = wire.connect()
    silent.sendall(wire.encode({"action": "list_task"}))
    slow = wire.connect()
    for byte in wire.encode({"action": "no_such"})[:8]:
        slow.sendall(bytes([byte]))
        time.sleep(0.3)
    slow.sendall(wire.encode({"action": "no_such"})[8:])
    assert wire.decode_stream(slow) == {"ack": "ok"}
    silent.close()
    slow.close()
    alive()


def test_many_clients_at_once(box):
    """More clients than the backlog are all served, one after the other."""
    box.start()
    clients = []
    for _ in range(6):
        sock = wire.connect()
        sock.sendall(wire.encode({"action": "list_task"}))
        clients.append(sock)
    for sock in clients:
        assert wire.decode_stream(sock)["task_list"] == []
        sock.close()


def test_requests_with_wrong_types(box):
    """Every command with keys of the wrong kind gives an error or an ack, never a crash."""
    box.start()
    odd = [None, -1, 1 << 63, "x" * 60000, b"\xff\xfe\n%s%n'\"", [], {}, [[["a"]]], {"a": {"b": 1}}]
    keys = ("task_id", "usb_share_path", "uuid", "task_type", "hub_share_name", "hub_folder_path",
            "custom_name", "black_name", "mountpoint", "device", "task_name")
    for action in ("add_task", "remove_task", "list_task", "list_entry", "set_filter_setting",
                   "get_filter_setting"):
        for value in odd:
            answer = wire.request({"action": action, **{key: value for key in keys}})
            assert answer["ack"] == "ok", (action, value)
    for hook in ("post_mount", "pre_unmount"):
        for value in odd:
            answer = wire.request({"notify": hook, "type": "volume_hook", "mountpoint": value,
                                   "device": value})
            assert answer == {"ack": "ok"}, (hook, value)
    assert wire.request({"action": odd, "notify": odd, "type": odd}) == {"ack": "ok"}
    alive()
