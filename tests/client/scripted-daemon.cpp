#include "client/scripted-daemon.h"

#include <gtest/gtest.h>

#include "ipc/channel.h"
#include "ipc/stream.h"

ScriptedDaemon::ScriptedDaemon(const std::string& path, Answer answer)
    : m_answer(std::move(answer)) {
    EXPECT_EQ(0, m_listener.Listen(path));
    m_thread = std::thread([this] {
        while (!m_is_ending) {
            if (m_listener.Wait()) ServeOne();
        }
    });
}

ScriptedDaemon::~ScriptedDaemon() {
    m_is_ending = true;
    m_thread.join();
}

void ScriptedDaemon::ServeOne() {
    Channel channel(Channel::DEFAULT_CAPACITY);
    const int descriptor = m_listener.Accept();
    if (descriptor < 0 || channel.Open(descriptor, true) != 0) return;
    PStream stream;
    PObject request;
    if (stream.Recv(channel, request) != 0) return;
    const auto answer = m_answer(request);
    EXPECT_TRUE(!answer || stream.Send(channel, *answer) == 0);
}
