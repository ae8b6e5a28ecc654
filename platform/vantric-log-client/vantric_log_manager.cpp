#include "vantric_log_manager.h"

#include <sqlite3.h>

#include <atomic>
#include <cerrno>
#include <cstdlib>
#include <ctime>
#include <memory>
#include <new>
#include <filesystem>
#include <string>
#include <sys/stat.h>

struct vantric_log_manager_s {
	sqlite3 *db;
};

namespace {

constexpr char default_db_path[] = "/var/lib/editor-svc-platform/usage-log.db";
constexpr int busy_timeout_ms = 5000;

constexpr char schema[] =
	"CREATE TABLE IF NOT EXISTS entries ("
	" id INTEGER PRIMARY KEY AUTOINCREMENT,"
	" uri TEXT NOT NULL,"
	" logged_time INTEGER NOT NULL);"
	"CREATE TABLE IF NOT EXISTS entry_values ("
	" entry_id INTEGER NOT NULL REFERENCES entries (id) ON DELETE CASCADE,"
	" key TEXT NOT NULL,"
	" value TEXT NOT NULL,"
	" PRIMARY KEY (entry_id, key));"
	"CREATE INDEX IF NOT EXISTS entry_values_by_pair ON entry_values (key, value);";

std::atomic<int> call_count;
std::atomic<bool> fail_create;
std::atomic<int> last_request_id;

struct StmtFinalizer {
	void operator()(sqlite3_stmt *stmt) const { sqlite3_finalize(stmt); }
};
using Stmt = std::unique_ptr<sqlite3_stmt, StmtFinalizer>;

std::string db_path()
{
	const char *path = getenv("VANTRIC_LOG_DB");
	return (path && *path) ? path : default_db_path;
}

bool make_directories(const std::string &dir)
{
	std::error_code error;
	return dir.empty() || std::filesystem::create_directories(dir, error) || std::filesystem::is_directory(dir, error);
}

sqlite3 *open_db()
{
	std::string path = db_path();
	size_t slash = path.find_last_of('/');
	if (slash != std::string::npos && !make_directories(path.substr(0, slash)))
		return nullptr;
	sqlite3 *db = nullptr;
	if (sqlite3_open_v2(path.c_str(), &db, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, nullptr) != SQLITE_OK) {
		sqlite3_close(db);
		return nullptr;
	}
	sqlite3_busy_timeout(db, busy_timeout_ms);
	if (sqlite3_exec(db, "PRAGMA journal_mode=WAL; PRAGMA foreign_keys=ON", nullptr, nullptr, nullptr) != SQLITE_OK ||
	    sqlite3_exec(db, schema, nullptr, nullptr, nullptr) != SQLITE_OK) {
		sqlite3_close(db);
		return nullptr;
	}
	return db;
}

struct InsertValues {
	sqlite3_stmt *stmt;
	sqlite3_int64 entry_id;
	bool failed;
};

void insert_value(const char *key, const char *value, void *data)
{
	auto *values = static_cast<InsertValues *>(data);
	if (values->failed)
		return;
	sqlite3_reset(values->stmt);
	sqlite3_bind_int64(values->stmt, 1, values->entry_id);
	sqlite3_bind_text(values->stmt, 2, key, -1, SQLITE_TRANSIENT);
	sqlite3_bind_text(values->stmt, 3, value, -1, SQLITE_TRANSIENT);
	values->failed = sqlite3_step(values->stmt) != SQLITE_DONE;
}

// One entry and all its pairs, or nothing: a half-written entry would be
// counted under the wrong feature.
bool store_entry(sqlite3 *db, const char *uri, Kv_Bundle *entry)
{
	if (sqlite3_exec(db, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr) != SQLITE_OK)
		return false;
	bool stored = false;
	{
		sqlite3_stmt *raw = nullptr;
		sqlite3_prepare_v2(db, "INSERT INTO entries (uri, logged_time) VALUES (?1, ?2)", -1, &raw, nullptr);
		Stmt insert_entry(raw);
		raw = nullptr;
		sqlite3_prepare_v2(db, "INSERT INTO entry_values (entry_id, key, value) VALUES (?1, ?2, ?3)", -1,
				   &raw, nullptr);
		Stmt insert_pair(raw);
		if (insert_entry && insert_pair) {
			sqlite3_bind_text(insert_entry.get(), 1, uri, -1, SQLITE_TRANSIENT);
			sqlite3_bind_int64(insert_entry.get(), 2, static_cast<sqlite3_int64>(time(nullptr)));
			if (sqlite3_step(insert_entry.get()) == SQLITE_DONE) {
				InsertValues values = {insert_pair.get(), sqlite3_last_insert_rowid(db), false};
				bundle_foreach(entry, insert_value, &values);
				stored = !values.failed;
			}
		}
	}
	if (stored)
		stored = sqlite3_exec(db, "COMMIT", nullptr, nullptr, nullptr) == SQLITE_OK;
	if (!stored)
		sqlite3_exec(db, "ROLLBACK", nullptr, nullptr, nullptr);
	return stored;
}

} // namespace

extern "C" int vantric_log_manager_create(vantric_log_manager_h *handle)
{
	call_count++;
	if (!handle)
		return VANTRIC_LOG_ERROR_INVALID_PARAMETER;
	*handle = nullptr;
	if (fail_create)
		return VANTRIC_LOG_ERROR_NOT_CONNECTED;
	auto *manager = static_cast<vantric_log_manager_s *>(calloc(1, sizeof(vantric_log_manager_s)));
	if (!manager)
		return VANTRIC_LOG_ERROR_OUT_OF_MEMORY;
	manager->db = open_db();
	if (!manager->db) {
		free(manager);
		return VANTRIC_LOG_ERROR_IO;
	}
	*handle = manager;
	return VANTRIC_LOG_ERROR_NONE;
}

extern "C" int vantric_log_manager_insert(vantric_log_manager_h handle, const char *uri, Kv_Bundle *entry,
					  vantric_log_reply_cb callback, void *user_data, int *request_id)
{
	call_count++;
	if (request_id)
		*request_id = 0;
	if (!handle || !uri || !*uri || !entry)
		return VANTRIC_LOG_ERROR_INVALID_PARAMETER;
	int id = ++last_request_id;
	if (request_id)
		*request_id = id;
	int result = store_entry(handle->db, uri, entry) ? VANTRIC_LOG_ERROR_NONE : VANTRIC_LOG_ERROR_IO;
	if (callback)
		callback(id, result, user_data);
	return result;
}

extern "C" int vantric_log_manager_destroy(vantric_log_manager_h handle)
{
	call_count++;
	if (!handle)
		return VANTRIC_LOG_ERROR_INVALID_PARAMETER;
	sqlite3_close(handle->db);
	free(handle);
	return VANTRIC_LOG_ERROR_NONE;
}

extern "C" int vantric_log_manager_call_count(void)
{
	return call_count;
}

extern "C" void vantric_log_manager_fail_create(int fail)
{
	fail_create = fail != 0;
}

extern "C" int vantric_log_manager_count_entries(const char *key, const char *value)
{
	if (!key || !value)
		return 0;
	sqlite3 *db = nullptr;
	// Read only: counting must not create a database where there is none.
	if (sqlite3_open_v2(db_path().c_str(), &db, SQLITE_OPEN_READONLY, nullptr) != SQLITE_OK) {
		sqlite3_close(db);
		return 0;
	}
	sqlite3_busy_timeout(db, busy_timeout_ms);
	int count = 0;
	{
		sqlite3_stmt *raw = nullptr;
		sqlite3_prepare_v2(db, "SELECT COUNT(DISTINCT entry_id) FROM entry_values WHERE key = ?1 AND value = ?2",
				   -1, &raw, nullptr);
		Stmt select(raw);
		if (select) {
			sqlite3_bind_text(raw, 1, key, -1, SQLITE_TRANSIENT);
			sqlite3_bind_text(raw, 2, value, -1, SQLITE_TRANSIENT);
			if (sqlite3_step(raw) == SQLITE_ROW)
				count = sqlite3_column_int(raw, 0);
		}
	}
	sqlite3_close(db);
	return count;
}
