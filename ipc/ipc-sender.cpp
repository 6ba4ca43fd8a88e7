#include "ipc/ipc-sender.h"

#include "ipc/pobject.h"
#include "ipc/stream.h"

IPCSender::IPCSender() : m_channel(Channel::DEFAULT_CAPACITY) {}

IPCSender::~IPCSender() { m_channel.Close(); }

int IPCSender::Connect(const std::string& path) { return m_channel.Open(path) == 0 ? 0 : -1; }

void IPCSender::Close() { m_channel.Close(); }

int IPCSender::Send(const PObject& value) {
    PStream stream;
    if (stream.Send(m_channel, value) >= 0) return 0;
    // Half a request is no request; and closing would wait once more for a peer that does not read.
    m_channel.ResetWrite();
    return -1;
}

int IPCSender::Recv(PObject& value) {
    PStream stream;
    stream.RefuseBinaries();
    return stream.Recv(m_channel, value) < 0 ? -1 : 0;
}

int IPCSender::SendAndRecv(const PObject& request, bool want_reply, PObject& reply) {
    if (Send(request) != 0) return -1;
    return want_reply ? Recv(reply) : 0;
}
