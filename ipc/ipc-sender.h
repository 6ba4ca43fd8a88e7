// The client's end of a domain socket: sends one value, and may wait for the one that answers it.
//
// Threads: belongs to one thread. Ownership: owns its connection; the destructor closes it.
// Results: 0 or -1. A peer that accepts nobody, takes nothing, or says nothing for 60 seconds fails
// a Connect, a Send or a Recv.
#pragma once

#include <string>

#include "ipc/channel.h"

class PObject;

class IPCSender {
public:
    IPCSender();
    IPCSender(const IPCSender&) = delete;
    IPCSender& operator=(const IPCSender&) = delete;
    virtual ~IPCSender();

    // Sends, and when `want_reply` is set and sending worked, receives.
    [[nodiscard]] virtual int SendAndRecv(const PObject& request, bool want_reply, PObject& reply);
    // A failure drops what has not been sent yet; the connection is then good only for closing.
    [[nodiscard]] virtual int Send(const PObject& value);
    // A failure leaves in `value` what has arrived. A binary is refused: whoever listens at the
    // path has no business storing files with the rights of this process.
    [[nodiscard]] virtual int Recv(PObject& value);

    // -1 also when it is connected already; that connection stays.
    [[nodiscard]] int Connect(const std::string& path);
    void Close();

private:
    Channel m_channel;
};
