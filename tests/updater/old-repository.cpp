#include "updater/old-repository.h"

#include <algorithm>
#include <filesystem>

#include "db/raw-database.h"
#include "support/temp-dir.h"

namespace fs = std::filesystem;

namespace {

constexpr char TASK_DB[] =
    "PRAGMA journal_mode = WAL;PRAGMA synchronous = NORMAL;PRAGMA recursive_triggers = true;"
    "BEGIN;"
    "CREATE TABLE config_table ( key TEXT PRIMARY KEY, value TEXT NOT NULL );"
    "INSERT into config_table VALUES ('version', 1);"
    "CREATE TABLE usb_info_table ("
    " id INTEGER PRIMARY KEY AUTOINCREMENT, uuid TEXT UNIQUE NOT NULL,"
    " run_when_plug_in INTEGER NOT NULL, eject_when_task_done INTEGER NOT NULL,"
    " producer TEXT NOT NULL, product TEXT NOT NULL );"
    "CREATE TABLE task_info_table ("
    " id INTEGER PRIMARY KEY AUTOINCREMENT, usb_id INTEGER NOT NULL, is_enable INTEGER NOT NULL,"
    " task_name TEXT NOT NULL, task_type INTEGER NOT NULL, usb_folder_path TEXT NOT NULL,"
    " hub_folder_path TEXT NOT NULL, hub_share_name TEXT NOT NULL,"
    " last_copied_time INTEGER NOT NULL, copy_strategy INTEGER NOT NULL,"
    " keep_dir_structure INTEGER NOT NULL, smart_create_date_dir INTEGER NOT NULL,"
    " rename_photo_file INTEGER NOT NULL, conflict_policy INTEGER NOT NULL,"
    " error INTEGER NOT NULL );"
    "CREATE INDEX usb_info_table_uuid_idx on usb_info_table(uuid);"
    "CREATE INDEX task_info_table_usb_id_idx on task_info_table(usb_id);"
    "CREATE TRIGGER usb_info_delete_trigger AFTER DELETE ON usb_info_table BEGIN"
    "       DELETE FROM task_info_table WHERE usb_id = OLD.id; END;"
    "CREATE TRIGGER task_info_delete_trigger AFTER DELETE ON task_info_table BEGIN"
    "   DELETE FROM usb_info_table WHERE id = OLD.usb_id AND (0 = (SELECT COUNT(*) FROM "
    "task_info_table WHERE usb_id = OLD.usb_id)); END;"
    "INSERT INTO usb_info_table VALUES (1, 'uuid-one', 1, 0, 'Maker', 'Stick');"
    "INSERT INTO usb_info_table VALUES (2, 'uuid-two', 0, 1, '', 'Card');"
    "INSERT INTO task_info_table VALUES"
    " (1, 1, 1, 'Mirror', 1, '/', '/in', 'photos', 1600000000, 2, 1, 0, 0, 2, 0),"
    " (2, 1, 1, 'It''s 100%', 2, '/DCIM', '/', 'vid\"eo', 0, 3, 0, 1, 1, 1, -5),"
    " (4, 2, 0, 'Photos', 3, '/', '/', 'photos', 7, 3, 1, 0, 1, 2, 0),"
    " (9, 2, 1, 'Gone', 1, '/', '/', 'photos', 0, 2, 1, 0, 0, 2, 0);"
    "DELETE FROM task_info_table WHERE id = 9;"
    "COMMIT;";

constexpr char FILE_DB[] =
    "PRAGMA journal_mode = WAL;PRAGMA synchronous = NORMAL;"
    "BEGIN;"
    "CREATE TABLE config_table ( key TEXT PRIMARY KEY, value TEXT NOT NULL );"
    "CREATE TABLE file_info_table ( id INTEGER PRIMARY KEY, source_path TEXT UNIQUE NOT NULL,"
    " destination_path TEXT NOT NULL, file_type INTEGER NOT NULL, size INTEGER NOT NULL,"
    " mtime INTEGER NOT NULL );"
    "CREATE INDEX file_info_table_src_path_idx on file_info_table(source_path);"
    "CREATE INDEX file_info_table_dst_path_idx on file_info_table(destination_path);"
    "INSERT into config_table VALUES ('version', 1);"
    "INSERT INTO file_info_table VALUES (1, '/a.jpg', '/2024/a.jpg', 0, 10, 100),"
    " (2, '/sub', '/sub', 1, 0, 100), (3, '/sub/b.jpg', '/sub/b.jpg', 0, 5000000000, 101);"
    "COMMIT;";

constexpr const char* TABLES[] = {"config_table", "usb_info_table", "task_info_table",
                                  "file_info_table"};

}  // namespace

void MakeOldRepository(const std::string& repository) {
    fs::create_directories(repository + "/db");
    RawDatabase(repository + "/db/task-db.sqlite").Run(TASK_DB);
    for (const char* task : {"1", "2", "4"}) fs::create_directories(repository + "/task/" + task);
    for (const char* task : {"2", "4"}) {
        RawDatabase(repository + "/task/" + task + "/file-db.sqlite").Run(FILE_DB);
    }
}

std::string DumpDatabase(const std::string& path) {
    const TempDir scratch;
    for (const char* part : {"", "-wal", "-journal"}) {
        if (fs::exists(path + part)) fs::copy_file(path + part, (scratch / "db") + part);
    }
    RawDatabase database(scratch / "db");
    std::string text = database.Read("PRAGMA integrity_check;") + "\n" +
                       database.Read(
                           "SELECT sql FROM sqlite_master WHERE sql NOT NULL ORDER BY "
                           "type, name;") +
                       "\n";
    for (const char* table : TABLES) {
        const std::string name = table;
        if (database.Read("SELECT COUNT(*) FROM sqlite_master WHERE name = '" + name + "';") ==
            "0") {
            continue;
        }
        const std::string columns = database.Read(
            "SELECT group_concat('quote(' || name || ')', ' || '','' || ') FROM "
            "pragma_table_info('" +
            name + "');");
        text += name + ": " +
                database.Read("SELECT " + columns + " FROM " + name + " ORDER BY 1;") + "\n";
    }
    return text;
}

std::vector<std::string> DatabasesOf(const std::string& repository) {
    std::vector<std::string> paths;
    for (const std::string& path : FilesIn(repository)) {
        if (path.ends_with(".sqlite")) paths.push_back(path);
    }
    return paths;
}

std::vector<std::string> FilesIn(const std::string& folder) {
    std::vector<std::string> paths;
    for (const auto& entry : fs::recursive_directory_iterator(folder)) {
        if (!entry.is_directory()) paths.push_back(fs::relative(entry.path(), folder).string());
    }
    std::ranges::sort(paths);
    return paths;
}
