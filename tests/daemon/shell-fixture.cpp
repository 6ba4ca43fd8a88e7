#include "shell-fixture.h"

#include <algorithm>

#include "platform/global-setting.h"
#include "platform/package-paths.h"

ShellTest::ShellTest() : m_fake(FakeKeld::Reset()) {
    m_dir.MakeDir("package/etc");
    SetPackageFolderForTest(m_dir / "package");
    EXPECT_TRUE(SetRepoVolPath(m_dir / "v1"));
    EXPECT_EQ(m_dir / "v1", GetRepoVolPath());
    m_db_folder = m_dir.MakeDir("v1/@Ferrix/db");
    m_log.Clear();
}

ShellTest::~ShellTest() {
    if (FerrixdPeer::ProcessorCount(m_app) != 0) Handle(Action("stop"));
    SetPackageFolderForTest("");
}

PObject ShellTest::Handle(const PObject& request) {
    PObject response;
    FerrixdPeer::Handle(m_app, request, response);
    return response;
}

PObject ShellTest::Action(const std::string& name) {
    PObject request;
    request["action"] = name;
    return request;
}

size_t ShellTest::PlaceOf(const std::string& line) const {
    const std::vector<std::string> lines = m_log.Lines();
    const auto place = std::ranges::find(lines, line);
    EXPECT_NE(lines.end(), place) << "no line: " << line;
    return static_cast<size_t>(place - lines.begin());
}
