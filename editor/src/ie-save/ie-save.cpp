/* Saving the edited picture as a new JPEG beside the source. The picture is
 * written to a temporary file in the destination directory, flushed, and
 * only then published under its name, never replacing a file already
 * there: a failed save leaves the directory as it was and the source is
 * never touched. */
#include "ie-save.h"
#include "ie-save-private.h"

#include <Ecore_File.h>

#include <cerrno>
#include <cinttypes>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <memory>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>

#include <media_db.h>
#include <storage_space.h>

#include "ie-debug.h"

namespace {

constexpr size_t SAVE_BUF_LEN = 512;
constexpr int FIRST_COUNTER = 1;
constexpr int LAST_COUNTER = 998;
/* Stripped names this long are cut so the suffix still fits a file name. */
constexpr size_t LONG_NAME_LEN = 240;
constexpr size_t LONG_NAME_LIMIT = 235;
constexpr size_t SHORT_NAME_LIMIT = 256;
constexpr char SAVE_EXT[] = ".jpg";
/* Room for the temporary name ".ie-save-XXXXXXXX.jpg" after the directory. */
constexpr size_t TEMP_PATH_LEN = SAVE_BUF_LEN + 32;
constexpr int TEMP_ATTEMPTS = 64;

char save_dir[SAVE_BUF_LEN];
char save_name[SAVE_BUF_LEN];
char save_path[SAVE_BUF_LEN];
/* The name before its counter, and the counter in use (0: none), so that a
 * save finding its name taken can move on to the next free one. */
char save_stem[SAVE_BUF_LEN];
bool save_stem_ready;
int save_counter;

struct FreeDeleter {
	void operator()(void *ptr) const { free(ptr); }
};
using CString = std::unique_ptr<char, FreeDeleter>;

/* Formats "<stem>_eNNN" into `name`; false when it does not fit. */
bool _save_format_name(char *name, size_t size, const char *stem, int counter)
{
	char suffix[20];
	snprintf(suffix, sizeof(suffix), "_e%03d", counter);
	int written = snprintf(name, size, "%s%s", stem, suffix);
	return written >= 0 && static_cast<size_t>(written) < size;
}

/* Points save_name and save_path at `counter`; false when the path would
 * not fit its buffer. */
Eina_Bool _save_compose_path(int counter)
{
	char name[SAVE_BUF_LEN];
	if (!_save_format_name(name, sizeof(name), save_stem, counter))
		return EINA_FALSE;
	char path[SAVE_BUF_LEN];
	int written = snprintf(path, sizeof(path), "%s%s%s%s", save_dir, "/", name, SAVE_EXT);
	if (written < 0 || static_cast<size_t>(written) >= sizeof(path))
		return EINA_FALSE;
	memcpy(save_name, name, sizeof(save_name));
	memcpy(save_path, path, sizeof(save_path));
	save_counter = counter;
	return EINA_TRUE;
}

void _save_clear_choice(void)
{
	save_name[0] = '\0';
	save_path[0] = '\0';
	save_counter = 0;
}

/* Searches the first free counter for the source's name and keeps the stem
 * for later searches. Returns the chosen name, or NULL. */
char *_save_get_filename_from_fullpath(const char *filepath)
{
	const char *base = ecore_file_file_get(filepath);
	CString filename(base ? strdup(base) : nullptr);
	IE_CHECK_NULL_AS(filename, "filename");
	CString dir(ecore_file_dir_get(filepath));
	if (!dir)
		return nullptr;
	CString stripped(ecore_file_strip_ext(filename.get()));
	if (!stripped)
		return nullptr;

	size_t limit = strlen(stripped.get()) < LONG_NAME_LEN ? SHORT_NAME_LIMIT : LONG_NAME_LIMIT;
	size_t size = strlen(dir.get()) + limit + 40;
	CString name(static_cast<char *>(calloc(1, size)));
	CString candidate(static_cast<char *>(calloc(1, size)));
	if (!name || !candidate) {
		IE_LOG_E("calloc failed");
		return nullptr;
	}
	snprintf(name.get(), limit, "%s", stripped.get());
	size_t stem_len = strlen(name.get());

	// The counter always has three digits, so one length check covers every
	// candidate; a directory cut to fit save_dir would name another place.
	if (strlen(dir.get()) + 1 + stem_len + strlen("_e001") + strlen(SAVE_EXT) >= SAVE_BUF_LEN) {
		IE_LOG_E("Save path does not fit %zu characters", SAVE_BUF_LEN - 1);
		return nullptr;
	}
	memcpy(save_stem, name.get(), stem_len + 1);
	save_stem_ready = true;

	for (int counter = FIRST_COUNTER; counter <= LAST_COUNTER; counter++) {
		_save_format_name(name.get() + stem_len, size - stem_len, "", counter);
		snprintf(candidate.get(), size, "%s/%s%s", dir.get(), name.get(), SAVE_EXT);
		if (!ecore_file_exists(candidate.get())) {
			save_counter = counter;
			return strdup(name.get());
		}
	}
	IE_LOG_E("No free name left beside %s", filepath);
	return nullptr;
}

void _save_create_auto_filename(const char *filepath)
{
	if (!filepath[0]) {
		IE_LOG_E("File path is empty, return!");
		return;
	}
	CString dir(ecore_file_dir_get(filepath));
	if (!dir)
		return;
	snprintf(save_dir, sizeof(save_dir), "%s", dir.get());
	CString name(_save_get_filename_from_fullpath(filepath));
	if (name)
		snprintf(save_name, sizeof(save_name), "%s", name.get());
}

/* An existing entry of any kind, a dangling link included, makes a name
 * taken. */
bool _save_name_taken(const char *path)
{
	struct stat st;
	return lstat(path, &st) == 0 || errno != ENOENT;
}

/* Moves save_name and save_path to the first free counter from `first`. */
Eina_Bool _save_pick_free_name(int first)
{
	if (!save_stem_ready)
		return EINA_FALSE;
	for (int counter = first; counter <= LAST_COUNTER; counter++) {
		if (!_save_compose_path(counter))
			break;
		if (!_save_name_taken(save_path))
			return EINA_TRUE;
	}
	_save_clear_choice();
	IE_LOG_E("No free name left in %s", save_dir);
	return EINA_FALSE;
}

bool _save_on_sdcard(const char *path)
{
	size_t len = strlen(IE_SAVE_SDCARD_ROOT);
	return strncmp(path, IE_SAVE_SDCARD_ROOT, len) == 0 && (path[len] == '/' || path[len] == '\0');
}

/* Creates an empty temporary "*.jpg" (Evas picks its saver by the
 * extension) in save_dir, with the mode a plain new file would get. */
bool _save_temp_create(char *tmp_path, size_t size)
{
	for (int attempt = 0; attempt < TEMP_ATTEMPTS; attempt++) {
		uint32_t random_part = 0;
		if (getrandom(&random_part, sizeof(random_part), GRND_NONBLOCK) != sizeof(random_part))
			random_part = static_cast<uint32_t>(getpid()) * 2654435761u + attempt;
		snprintf(tmp_path, size, "%s/.ie-save-%08" PRIx32 "%s", save_dir, random_part, SAVE_EXT);
		int fd = open(tmp_path, O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0666);
		if (fd >= 0) {
			close(fd);
			return true;
		}
		if (errno != EEXIST)
			break;
	}
	IE_LOG_E("Cannot create a temporary file in %s: %s", save_dir, strerror(errno));
	return false;
}

/* The saver neither syncs nor checks its final flush: make sure the data
 * reached the disk and that something was written at all. */
bool _save_flush_file(const char *path)
{
	int fd = open(path, O_RDONLY | O_CLOEXEC);
	struct stat st;
	bool flushed = fd >= 0 && fstat(fd, &st) == 0 && st.st_size > 0 && fsync(fd) == 0;
	int saved_errno = errno;
	if (fd >= 0)
		close(fd);
	if (!flushed)
		IE_LOG_E("Cannot flush %s: %s", path, strerror(saved_errno));
	return flushed;
}

/* Gives `tmp_path` the name `path` only if that name is free. */
int _save_link_noreplace(const char *tmp_path, const char *path)
{
	if (renameat2(AT_FDCWD, tmp_path, AT_FDCWD, path, RENAME_NOREPLACE) == 0)
		return 0;
	if (errno != EINVAL && errno != ENOSYS && errno != EOPNOTSUPP)
		return -1;
	// File systems without the no-replace rename: a hard link also refuses
	// an existing name.
	if (link(tmp_path, path) != 0)
		return -1;
	unlink(tmp_path);
	return 0;
}

/* Publishes the written file under save_path, or under the next free name
 * when that one was taken since it was chosen. */
bool _save_publish(const char *tmp_path)
{
	while (_save_link_noreplace(tmp_path, save_path) != 0) {
		if (errno != EEXIST) {
			IE_LOG_E("Cannot publish %s: %s", save_path, strerror(errno));
			return false;
		}
		IE_LOG_W("%s was taken, looking for another name", save_path);
		if (!_save_pick_free_name(save_counter + 1))
			return false;
	}
	int dir_fd = open(save_dir, O_RDONLY | O_DIRECTORY | O_CLOEXEC);
	if (dir_fd < 0 || fsync(dir_fd) != 0)
		IE_LOG_W("Cannot flush directory %s: %s", save_dir, strerror(errno));
	if (dir_fd >= 0)
		close(dir_fd);
	return true;
}

Eina_Bool _save_image_file(Evas_Object *img)
{
	char tmp_path[TEMP_PATH_LEN];
	if (!_save_temp_create(tmp_path, sizeof(tmp_path)))
		return EINA_FALSE;
	evas_object_image_alpha_set(img, EINA_TRUE);
	bool saved = evas_object_image_save(img, tmp_path, nullptr, nullptr) &&
		     _save_flush_file(tmp_path) && _save_publish(tmp_path);
	// After a publish the temporary name is already gone.
	unlink(tmp_path);
	return saved ? EINA_TRUE : EINA_FALSE;
}

} // namespace

Eina_Bool ie_save_free_space_enough(const struct statvfs *st)
{
	unsigned long long free_bytes = static_cast<unsigned long long>(st->f_bsize) *
					static_cast<unsigned long long>(st->f_bavail);
	return free_bytes >= IE_SAVE_MIN_FREE_BYTES ? EINA_TRUE : EINA_FALSE;
}

void _save_init(const char *filepath)
{
	IE_CHECK(filepath);
	save_dir[0] = '\0';
	save_stem[0] = '\0';
	save_stem_ready = false;
	_save_clear_choice();

	_save_create_auto_filename(filepath);
	if (!save_name[0] || !_save_compose_path(save_counter))
		_save_clear_choice();
}

const char *ie_save_path_get(void)
{
	return save_path;
}

Eina_Bool get_internal_memory_status(struct statvfs *st)
{
	IE_CHECK_VAL(st, EINA_FALSE);
	int ret = _save_on_sdcard(save_path) ? statvfs(IE_SAVE_SDCARD_ROOT, st)
					     : storage_get_internal_memory_size(st);
	if (ret != 0) {
		IE_LOG_E("fail to get memory size");
		return EINA_FALSE;
	}
	if (!ie_save_free_space_enough(st)) {
		IE_LOG_E("Memory is almost full < 1MB");
		return EINA_FALSE;
	}
	return EINA_TRUE;
}

char *_save_to_file(Evas_Object *img, Eina_Bool *memory_full)
{
	IE_CHECK_NULL(img);
	// No free name at load time: one may have been freed since.
	if (!save_path[0] && !_save_pick_free_name(FIRST_COUNTER))
		return nullptr;

	struct statvfs st;
	if (!get_internal_memory_status(&st)) {
		IE_LOG_E("Out of memory");
		if (memory_full)
			*memory_full = EINA_TRUE;
		return nullptr;
	}
	if (!_save_image_file(img))
		return nullptr;

	int ret = media_content_scan_file(save_path);
	if (ret != MEDIA_DB_ERROR_NONE)
		IE_LOG_W("Fail to register new edited file to DB : %d", ret);

	size_t len = strlen(save_path);
	char *path = static_cast<char *>(calloc(len + 1, 1));
	if (path)
		memcpy(path, save_path, len);
	return path;
}
