// Sends one command to the daemon from another process, and reads what it says to it.
//
// Threads: belongs to one thread. Each command has a connection of its own.
#pragma once

#include <string>

class PObject;

class DaemonIPC {
public:
    static constexpr const char* SOCKET_PATH = "/tmp/ferrix-socket";

    explicit DaemonIPC(std::string socket_path = SOCKET_PATH);

    // 0 when the daemon acknowledged the command, and also, without reading anything, when the
    // request says with a false "need_ack" that no answer is wanted. Else -1: not reachable, hung
    // up, silent for 60 seconds, or refused; a refusal is in the "error" and "error_code" of
    // `response`, which holds whatever arrived and is left alone when nothing did.
    [[nodiscard]] int SendCommand(const PObject& request, PObject& response);

private:
    std::string m_socket_path;
};
