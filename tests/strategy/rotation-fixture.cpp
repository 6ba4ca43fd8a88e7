#include "rotation-fixture.h"

#include "strategy/rotation-handler.h"

RotationFixture::RotationFixture() {
    m_task.enable_rotation = true;
    m_task.max_version_count = 2;
}

int RotationFixture::Rotate(uint32_t now) {
    RotationHandler rotation(now);
    rotation.Init(m_task);
    rotation.SetAbortFlag(&m_abort);
    return rotation.Run();
}

void RotationFixture::MakeMay(std::initializer_list<const char*> days) {
    for (const char* day : days) MakeVersion(May(day));
}

std::string RotationFixture::May(const std::string& day) {
    return "Ferrix Copy_2024-05-" + day.substr(0, 2) + "_100000" + day.substr(2);
}

void RotationFixture::EnableBin() {
    m_fake.AddShare({.name = "photos", .path = m_share, .recycle_bin = true});
}
