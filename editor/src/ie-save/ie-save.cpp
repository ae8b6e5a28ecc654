/* Saving the edited picture as a new JPEG beside the source.
 *
 * Other users may write to the destination folder, so once a save starts
 * nothing is reached through a name they could swap: the picture is written
 * to an unnamed file in that folder (O_TMPFILE), which Evas's saver reaches
 * through a link in a private directory of this process; it is flushed,
 * linked under its name without replacing any entry, and checked to be the
 * file that was written. A process killed on the way leaves nothing in the
 * folder. File systems without unnamed files get a private directory (mode
 * 0700) made in the folder instead, locked while in use and published from
 * with a rename that never replaces; one left behind by a process that died
 * is removed by the next save in that folder. A failed save leaves the
 * folder as it was; the source is never touched. */
#include "ie-save.h"
#include "ie-save-private.h"

#include <Ecore.h>
#include <Ecore_File.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <dirent.h>
#include <fcntl.h>
#include <memory>
#include <string>
#include <sys/file.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>

#include <media_db.h>
#include <storage_space.h>

#include "ie-debug.h"
#include "ie-malloc-ptr.h"

namespace {

constexpr size_t SAVE_BUF_LEN = 512;
constexpr int FIRST_COUNTER = 1;
constexpr int LAST_COUNTER = 998;
/* Stripped names this long are cut so the suffix still fits a file name. */
constexpr size_t LONG_NAME_LEN = 240;
constexpr size_t LONG_NAME_CUT = 234;
constexpr char SAVE_EXT[] = ".jpg";
constexpr int WORK_DIR_ATTEMPTS = 64;
constexpr size_t WORK_DIR_RANDOM_LEN = 12;
constexpr char WORK_DIR_ALPHABET[] = "abcdefghijklmnopqrstuvwxyz0123456789";
/* Inside a private directory: what the encoder wrote, and its copy with
 * the source's metadata. */
constexpr char WORK_PICTURE[] = "picture.jpg";
constexpr char WORK_OUTPUT[] = "output.jpg";

char save_dir[SAVE_BUF_LEN];
char save_name[SAVE_BUF_LEN];
char save_path[SAVE_BUF_LEN];
/* The name before its counter, and the counter in use (0: none), so that a
 * save finding its name taken can move on to the next free one. */
char save_stem[SAVE_BUF_LEN];
bool save_stem_ready;
int save_counter;
/* The source, whose metadata the saved picture carries. */
char save_source[PATH_MAX];
/* Unnamed scratch files where the file system has them; tests turn them
 * off to reach the private directory other file systems get. */
bool save_unnamed_files = true;

using CString = Ie_Malloc_Ptr<char>;

class Fd {
public:
	explicit Fd(int fd = -1) : fd_(fd) {}
	Fd(const Fd &) = delete;
	Fd &operator=(const Fd &) = delete;
	~Fd() { reset(); }
	int get() const { return fd_; }
	explicit operator bool() const { return fd_ >= 0; }
	void reset(int fd = -1)
	{
		if (fd_ >= 0)
			close(fd_);
		fd_ = fd;
	}

private:
	int fd_;
};

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

/* Length of `name` cut to at most `limit` bytes without splitting a UTF-8
 * character: a file name must stay valid text. */
size_t _save_utf8_cut(const char *name, size_t limit)
{
	size_t len = strlen(name);
	if (len <= limit)
		return len;
	while (limit > 0 && (static_cast<unsigned char>(name[limit]) & 0xC0) == 0x80)
		limit--;
	return limit;
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
	// A name that is all extension (".jpg", ".photo") is kept whole.
	CString stripped(ecore_file_strip_ext(filename.get()));
	if (!stripped || !stripped.get()[0])
		stripped.reset(strdup(filename.get()));
	if (!stripped)
		return nullptr;

	size_t stem_len = strlen(stripped.get());
	if (stem_len >= LONG_NAME_LEN)
		stem_len = _save_utf8_cut(stripped.get(), LONG_NAME_CUT);
	size_t size = strlen(dir.get()) + stem_len + 40;
	CString name(static_cast<char *>(calloc(1, size)));
	CString candidate(static_cast<char *>(calloc(1, size)));
	if (!name || !candidate) {
		IE_LOG_E("calloc failed");
		return nullptr;
	}
	memcpy(name.get(), stripped.get(), stem_len);

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
	if (!save_stem_ready) {
		IE_LOG_E("No name to save the picture under");
		return EINA_FALSE;
	}
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

/* ---- The private directory ------------------------------------------- */

struct WorkDir {
	int fd = -1;
	char name[sizeof(IE_SAVE_WORK_DIR_PREFIX) + WORK_DIR_RANDOM_LEN] = "";
};

bool _work_dir_name_valid(const char *name)
{
	size_t prefix = strlen(IE_SAVE_WORK_DIR_PREFIX);
	if (strncmp(name, IE_SAVE_WORK_DIR_PREFIX, prefix) != 0 || strlen(name) != prefix + WORK_DIR_RANDOM_LEN)
		return false;
	for (const char *c = name + prefix; *c; c++)
		if (!strchr(WORK_DIR_ALPHABET, *c))
			return false;
	return true;
}

void _work_dir_random_name(char *name, size_t size, int attempt)
{
	unsigned char bytes[WORK_DIR_RANDOM_LEN];
	if (getrandom(bytes, sizeof(bytes), GRND_NONBLOCK) != static_cast<ssize_t>(sizeof(bytes))) {
		uint64_t mix = (static_cast<uint64_t>(getpid()) << 32) ^ static_cast<uint64_t>(clock()) ^
			       (static_cast<uint64_t>(attempt) * 0x9E3779B97F4A7C15ull);
		for (unsigned char &byte : bytes) {
			mix = mix * 6364136223846793005ull + 1442695040888963407ull;
			byte = static_cast<unsigned char>(mix >> 56);
		}
	}
	char random_part[WORK_DIR_RANDOM_LEN + 1];
	for (size_t i = 0; i < WORK_DIR_RANDOM_LEN; i++)
		random_part[i] = WORK_DIR_ALPHABET[bytes[i] % (sizeof(WORK_DIR_ALPHABET) - 1)];
	random_part[WORK_DIR_RANDOM_LEN] = '\0';
	snprintf(name, size, "%s%s", IE_SAVE_WORK_DIR_PREFIX, random_part);
}

/* Only a directory of this user that no one else may enter is ours. */
bool _work_dir_private(int fd)
{
	struct stat st;
	return fstat(fd, &st) == 0 && S_ISDIR(st.st_mode) && st.st_nlink > 0 && st.st_uid == geteuid() &&
	       (st.st_mode & 077) == 0;
}

/* Empties and removes a private directory whose lock `work` holds, then
 * closes it. The name is removed only while it still is that directory. */
void _work_dir_remove(int folder, WorkDir *work)
{
	unlinkat(work->fd, WORK_PICTURE, 0);
	unlinkat(work->fd, WORK_OUTPUT, 0);
	struct stat mine, named;
	if (fstat(work->fd, &mine) == 0 && fstatat(folder, work->name, &named, AT_SYMLINK_NOFOLLOW) == 0 &&
	    named.st_dev == mine.st_dev && named.st_ino == mine.st_ino)
		unlinkat(folder, work->name, AT_REMOVEDIR);
	close(work->fd);
	work->fd = -1;
}

/* Removes the private directories that saves killed on their way left in
 * `folder`: ours by name, owner and mode, and locked by no live process. */
void _work_dirs_remove_stale(int folder)
{
	int scan_fd = openat(folder, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
	DIR *listing = scan_fd >= 0 ? fdopendir(scan_fd) : nullptr;
	if (!listing) {
		if (scan_fd >= 0)
			close(scan_fd);
		return;
	}
	while (dirent *entry = readdir(listing)) {
		if ((entry->d_type != DT_DIR && entry->d_type != DT_UNKNOWN) || !_work_dir_name_valid(entry->d_name))
			continue;
		WorkDir stale;
		stale.fd = openat(folder, entry->d_name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
		if (stale.fd < 0)
			continue;
		if (_work_dir_private(stale.fd) && flock(stale.fd, LOCK_EX | LOCK_NB) == 0) {
			snprintf(stale.name, sizeof(stale.name), "%s", entry->d_name);
			_work_dir_remove(folder, &stale);
		} else {
			close(stale.fd);
		}
	}
	closedir(listing);
}

/* Makes and locks a fresh private directory in `folder`. A cleaner may
 * remove a new directory before it is locked, and another user may swap
 * it: either way another name is tried. Returns 0 or an errno value. */
int _work_dir_create(int folder, WorkDir *work)
{
	for (int attempt = 0; attempt < WORK_DIR_ATTEMPTS; attempt++) {
		_work_dir_random_name(work->name, sizeof(work->name), attempt);
		if (mkdirat(folder, work->name, 0700) != 0) {
			if (errno == EEXIST)
				continue;
			return errno;
		}
		int fd = openat(folder, work->name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
		if (fd >= 0 && flock(fd, LOCK_EX | LOCK_NB) == 0 && _work_dir_private(fd)) {
			work->fd = fd;
			return 0;
		}
		if (fd >= 0)
			close(fd);
	}
	return EEXIST;
}

/* ---- Scratch files ---------------------------------------------------- */

/* Evas's saver opens a path and picks its format by the extension, which
 * an unnamed file does not have: it reaches one through a link named
 * WORK_PICTURE in a private directory of this process, made once in the
 * user's runtime (or temporary) directory and locked while the process
 * lives, so that a later process may sweep it away. */
WorkDir link_dir;

bool _link_dir_ready(void)
{
	if (link_dir.fd >= 0)
		return true;
	const char *base = getenv("XDG_RUNTIME_DIR");
	if (!base || !*base)
		base = getenv("TMPDIR");
	Fd base_fd(open(base && *base ? base : "/tmp", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
	if (!base_fd)
		return false;
	_work_dirs_remove_stale(base_fd.get());
	return _work_dir_create(base_fd.get(), &link_dir) == 0;
}

/* Where one save writes before it publishes, in the destination folder:
 * unnamed files, or named ones inside a private directory made there. */
struct Scratch {
	int folder = -1;
	WorkDir work; /* fd -1 while unnamed files are used */
	bool unnamed() const { return work.fd < 0; }
};

/* A new scratch file, open for reading and writing; `name` names it in a
 * private directory. Returns 0 or an errno value. */
int _scratch_file_create(const Scratch &scratch, const char *name, Fd *file)
{
	file->reset(scratch.unnamed()
			    ? openat(scratch.folder, ".", O_TMPFILE | O_RDWR | O_CLOEXEC, 0666)
			    : openat(scratch.work.fd, name, O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0666));
	if (*file)
		return 0;
	int err = errno;
	IE_LOG_E("Cannot create a file in %s: %s", save_dir, strerror(err));
	return err;
}

/* Prepares the scratch space in `folder` and creates the encoder's file
 * in it. Returns 0 or an errno value. */
int _scratch_open(int folder, Scratch *scratch, Fd *picture)
{
	scratch->folder = folder;
	_work_dirs_remove_stale(folder);
	if (save_unnamed_files && _link_dir_ready()) {
		picture->reset(openat(folder, ".", O_TMPFILE | O_RDWR | O_CLOEXEC, 0666));
		if (*picture)
			return 0;
		// What file systems without unnamed files answer.
		if (errno != EOPNOTSUPP && errno != EISDIR && errno != EINVAL) {
			int err = errno;
			IE_LOG_E("Cannot create a file in %s: %s", save_dir, strerror(err));
			return err;
		}
	}
	int err = _work_dir_create(folder, &scratch->work);
	if (err) {
		IE_LOG_E("Cannot create a private directory in %s: %s", save_dir, strerror(err));
		return err;
	}
	return _scratch_file_create(*scratch, WORK_PICTURE, picture);
}

void _scratch_close(Scratch *scratch)
{
	if (!scratch->unnamed())
		_work_dir_remove(scratch->folder, &scratch->work);
}

/* ---- Writing --------------------------------------------------------- */

/* The encoder drops alpha from premultiplied pixels, which darkens them:
 * lay them on white instead (white shows through by 255 - alpha). Works on
 * a copy: the picture on screen stays as it is if the save fails. */
Evas_Object *_save_flattened_copy(Evas_Object *img)
{
	int w = 0, h = 0;
	evas_object_image_size_get(img, &w, &h);
	int src_stride = evas_object_image_stride_get(img);
	auto *src = static_cast<const uint8_t *>(evas_object_image_data_get(img, EINA_FALSE));
	if (!src || w <= 0 || h <= 0)
		return nullptr;
	Evas_Object *flat = evas_object_image_add(evas_object_evas_get(img));
	evas_object_image_alpha_set(flat, EINA_FALSE);
	evas_object_image_size_set(flat, w, h);
	int dst_stride = evas_object_image_stride_get(flat);
	auto *dst = static_cast<uint8_t *>(evas_object_image_data_get(flat, EINA_TRUE));
	if (!dst) {
		evas_object_del(flat);
		return nullptr;
	}
	for (int y = 0; y < h; y++) {
		auto *in = reinterpret_cast<const uint32_t *>(src + static_cast<size_t>(y) * src_stride);
		auto *out = reinterpret_cast<uint32_t *>(dst + static_cast<size_t>(y) * dst_stride);
		for (int x = 0; x < w; x++) {
			uint32_t p = in[x];
			uint32_t white = 255 - (p >> 24);
			uint32_t r = std::min<uint32_t>(255, ((p >> 16) & 0xFF) + white);
			uint32_t g = std::min<uint32_t>(255, ((p >> 8) & 0xFF) + white);
			uint32_t b = std::min<uint32_t>(255, (p & 0xFF) + white);
			out[x] = 0xFF000000u | r << 16 | g << 8 | b;
		}
	}
	evas_object_image_data_set(flat, dst);
	return flat;
}

/* The encoder reports no cause: its errno if it tells, else a full
 * storage if the room left says so. */
int _save_encoder_error(int encoder_errno, int fd)
{
	if (encoder_errno == ENOSPC || encoder_errno == EDQUOT)
		return encoder_errno;
	struct statvfs st;
	if (fstatvfs(fd, &st) == 0 && !ie_save_free_space_enough(&st))
		return ENOSPC;
	return encoder_errno ? encoder_errno : EIO;
}

/* Has Evas's saver write `img` into the scratch file `picture` through a
 * name in a private directory, so that the path leads nowhere else.
 * Returns 0 or an errno value. */
int _save_encode(Evas_Object *img, const Scratch &scratch, int picture)
{
	char target[64];
	if (scratch.unnamed()) {
		char unnamed[32];
		snprintf(unnamed, sizeof(unnamed), "/proc/self/fd/%d", picture);
		unlinkat(link_dir.fd, WORK_PICTURE, 0);
		if (symlinkat(unnamed, link_dir.fd, WORK_PICTURE) != 0) {
			int err = errno;
			IE_LOG_E("Cannot reach the picture's file: %s", strerror(err));
			return err;
		}
	}
	snprintf(target, sizeof(target), "/proc/self/fd/%d/%s", scratch.unnamed() ? link_dir.fd : scratch.work.fd,
		 WORK_PICTURE);
	Eina_Bool had_alpha = evas_object_image_alpha_get(img);
	Evas_Object *flat = nullptr;
	if (had_alpha) {
		flat = _save_flattened_copy(img);
		if (!flat) {
			IE_LOG_E("Cannot lay the picture on white: %s", strerror(ENOMEM));
			return ENOMEM;
		}
	} else {
		evas_object_image_alpha_set(img, EINA_TRUE);
	}
	errno = 0;
	Eina_Bool written = evas_object_image_save(flat ? flat : img, target, nullptr, nullptr);
	int encoder_errno = errno;
	if (scratch.unnamed())
		unlinkat(link_dir.fd, WORK_PICTURE, 0);
	// The flag tells whether the picture has alpha, for the next save too.
	if (flat)
		evas_object_del(flat);
	else
		evas_object_image_alpha_set(img, EINA_FALSE);
	if (written)
		return 0;
	int err = _save_encoder_error(encoder_errno, picture);
	IE_LOG_E("Cannot write the picture in %s: %s", save_dir, strerror(err));
	return err;
}

bool _save_write_all(int fd, const char *data, size_t len)
{
	while (len > 0) {
		ssize_t done = write(fd, data, len);
		if (done < 0 && errno == EINTR)
			continue;
		if (done <= 0) {
			if (done == 0)
				errno = EIO;
			return false;
		}
		data += done;
		len -= static_cast<size_t>(done);
	}
	return true;
}

/* Copies the encoder's file into WORK_OUTPUT with `metadata` after its
 * start (and JFIF header). Returns 0 or an errno value; `output` stays
 * closed when the encoder's file cannot take the metadata, which is then
 * left out. */
int _save_add_metadata(int picture_fd, off_t size, const Scratch &scratch, const std::string &metadata, Fd *output)
{
	std::string jpeg(static_cast<size_t>(size), '\0');
	for (size_t done = 0; done < jpeg.size();) {
		ssize_t got = pread(picture_fd, &jpeg[done], jpeg.size() - done, static_cast<off_t>(done));
		if (got < 0 && errno == EINTR)
			continue;
		if (got <= 0) {
			int err = got < 0 ? errno : EIO;
			IE_LOG_E("Cannot read the written picture back: %s", strerror(err));
			return err;
		}
		done += static_cast<size_t>(got);
	}
	auto byte = [&jpeg](size_t at) { return static_cast<unsigned char>(jpeg[at]); };
	if (jpeg.size() < 4 || byte(0) != 0xFF || byte(1) != 0xD8) {
		IE_LOG_W("The written picture is no JPEG; saving it without metadata");
		return 0;
	}
	size_t insert_at = 2;
	if (byte(2) == 0xFF && byte(3) == 0xE0 && jpeg.size() >= 6) {
		size_t app0_end = 4 + (static_cast<size_t>(byte(4)) << 8 | byte(5));
		if (app0_end <= jpeg.size())
			insert_at = app0_end;
	}
	int err = _scratch_file_create(scratch, WORK_OUTPUT, output);
	if (err)
		return err;
	if (!_save_write_all(output->get(), jpeg.data(), insert_at) ||
	    !_save_write_all(output->get(), metadata.data(), metadata.size()) ||
	    !_save_write_all(output->get(), jpeg.data() + insert_at, jpeg.size() - insert_at)) {
		err = errno;
		IE_LOG_E("Cannot write the picture in %s: %s", save_dir, strerror(err));
		return err;
	}
	return 0;
}

/* Gives `from` in `from_dir` the name `to` in `to_dir` only if that name is
 * free; never follows or replaces what is there. */
int _save_rename_noreplace(int from_dir, const char *from, int to_dir, const char *to)
{
	if (renameat2(from_dir, from, to_dir, to, RENAME_NOREPLACE) == 0)
		return 0;
	if (errno != EINVAL && errno != ENOSYS && errno != EOPNOTSUPP)
		return -1;
	// File systems without the no-replace rename: a hard link also refuses
	// an existing name.
	if (linkat(from_dir, from, to_dir, to, 0) != 0)
		return -1;
	unlinkat(from_dir, from, 0);
	return 0;
}

/* Gives the scratch file `fd` (`work_name` in a private directory) the
 * name `final_name` in the folder, only if that name is free. */
int _scratch_publish(const Scratch &scratch, const char *work_name, int fd, const char *final_name)
{
	if (!scratch.unnamed())
		return _save_rename_noreplace(scratch.work.fd, work_name, scratch.folder, final_name);
	char unnamed[32];
	snprintf(unnamed, sizeof(unnamed), "/proc/self/fd/%d", fd);
	return linkat(AT_FDCWD, unnamed, scratch.folder, final_name, AT_SYMLINK_FOLLOW);
}

/* Publishes the scratch file `fd` under save_path, or under the next free
 * name when that one was taken since it was chosen, and checks that the
 * name now holds that very file. Returns 0 or an errno value. */
int _save_publish(const Scratch &scratch, const char *work_name, int fd)
{
	struct stat written;
	if (fstat(fd, &written) != 0) {
		int err = errno;
		IE_LOG_E("Cannot publish %s: %s", save_path, strerror(err));
		return err;
	}
	char final_name[SAVE_BUF_LEN + sizeof(SAVE_EXT)];
	for (;;) {
		snprintf(final_name, sizeof(final_name), "%s%s", save_name, SAVE_EXT);
		if (_scratch_publish(scratch, work_name, fd, final_name) == 0)
			break;
		if (errno != EEXIST) {
			int err = errno;
			IE_LOG_E("Cannot publish %s: %s", save_path, strerror(err));
			return err;
		}
		IE_LOG_W("%s was taken, looking for another name", save_path);
		if (!_save_pick_free_name(save_counter + 1))
			return EEXIST;
	}
	struct stat published;
	if (fstatat(scratch.folder, final_name, &published, AT_SYMLINK_NOFOLLOW) != 0 ||
	    !S_ISREG(published.st_mode) || published.st_dev != written.st_dev || published.st_ino != written.st_ino) {
		IE_LOG_E("%s was replaced as it was published: %s", save_path, strerror(EEXIST));
		return EEXIST;
	}
	if (fsync(scratch.folder) != 0)
		IE_LOG_W("Cannot flush directory %s: %s", save_dir, strerror(errno));
	return 0;
}

/* Encodes, adds the source's metadata, flushes and publishes. Returns 0 or
 * an errno value. */
int _save_write_and_publish(Evas_Object *img, const Scratch &scratch, int picture)
{
	int err = _save_encode(img, scratch, picture);
	if (err)
		return err;
	struct stat st;
	if (fstat(picture, &st) != 0) {
		err = errno;
		IE_LOG_E("Cannot read the written picture back: %s", strerror(err));
		return err;
	}
	if (st.st_size <= 0) {
		IE_LOG_E("Cannot read the written picture back: %s", strerror(EIO));
		return EIO;
	}

	int w = 0, h = 0;
	evas_object_image_size_get(img, &w, &h);
	std::string metadata = ie_save_metadata_segments(save_source, w, h, time(nullptr));
	Fd output;
	if (!metadata.empty()) {
		err = _save_add_metadata(picture, st.st_size, scratch, metadata, &output);
		if (err)
			return err;
	}
	const char *name = output ? WORK_OUTPUT : WORK_PICTURE;
	int fd = output ? output.get() : picture;
	// The saver neither syncs nor checks its final flush.
	if (fsync(fd) != 0) {
		err = errno;
		IE_LOG_E("Cannot flush the picture in %s: %s", save_dir, strerror(err));
		return err;
	}
	return _save_publish(scratch, name, fd);
}

/* Returns 0 or an errno value. */
int _save_image_file(Evas_Object *img)
{
	Fd folder(open(save_dir, O_RDONLY | O_DIRECTORY | O_CLOEXEC));
	// A folder one may write to but not list still takes a save; only the
	// removal of leftovers and the flush of the folder need to read it.
	if (!folder && errno == EACCES)
		folder.reset(open(save_dir, O_PATH | O_DIRECTORY | O_CLOEXEC));
	if (!folder) {
		int err = errno;
		IE_LOG_E("Cannot open the folder %s: %s", save_dir, strerror(err));
		return err;
	}
	Scratch scratch;
	Fd picture;
	int err = _scratch_open(folder.get(), &scratch, &picture);
	if (!err)
		err = _save_write_and_publish(img, scratch, picture.get());
	_scratch_close(&scratch);
	return err;
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
	snprintf(save_source, sizeof(save_source), "%s", filepath);

	_save_create_auto_filename(filepath);
	if (!save_name[0] || !_save_compose_path(save_counter))
		_save_clear_choice();
}

const char *ie_save_path_get(void)
{
	return save_path;
}

void ie_save_unnamed_files_set(Eina_Bool enabled)
{
	save_unnamed_files = enabled;
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
	int err = _save_image_file(img);
	if (err) {
		if ((err == ENOSPC || err == EDQUOT) && memory_full)
			*memory_full = EINA_TRUE;
		return nullptr;
	}

	size_t len = strlen(save_path);
	char *path = static_cast<char *>(calloc(len + 1, 1));
	if (path)
		memcpy(path, save_path, len);
	else
		IE_LOG_E("calloc failed");
	return path;
}

/* ---- Registration ---------------------------------------------------- */

struct _Ie_Save_Registration {
	char *path;
	int result;
	Ie_Save_Registered_Cb done;
	void *data;
	/* The work ran on this thread inside ie_save_register: delivered by a
	 * job instead, since the caller is not ready for it yet. */
	Ecore_Job *delivery;
	bool starting;
	bool finished;
	bool abandoned;
};

namespace {

void _register_run(void *data, Ecore_Thread *)
{
	auto *registration = static_cast<Ie_Save_Registration *>(data);
	registration->result = media_content_scan_file(registration->path);
}

void _register_deliver(Ie_Save_Registration *registration)
{
	if (registration->result != MEDIA_DB_ERROR_NONE)
		IE_LOG_W("Fail to register new edited file to DB : %d", registration->result);
	char *path = registration->path;
	Ie_Save_Registered_Cb done = registration->abandoned ? nullptr : registration->done;
	void *data = registration->data;
	free(registration);
	if (done)
		done(data, path);
	else
		free(path);
}

void _register_delivery_job(void *data)
{
	auto *registration = static_cast<Ie_Save_Registration *>(data);
	registration->delivery = nullptr;
	_register_deliver(registration);
}

void _register_end(void *data, Ecore_Thread *)
{
	auto *registration = static_cast<Ie_Save_Registration *>(data);
	registration->finished = true;
	if (!registration->starting)
		_register_deliver(registration);
}

} // namespace

Ie_Save_Registration *ie_save_register(char *path, Ie_Save_Registered_Cb done, void *data)
{
	auto *registration = static_cast<Ie_Save_Registration *>(calloc(1, sizeof(Ie_Save_Registration)));
	if (!registration) {
		IE_LOG_E("calloc failed");
		return nullptr;
	}
	registration->path = path;
	registration->result = MEDIA_DB_ERROR_DB_FAILED;
	registration->done = done;
	registration->data = data;
	registration->starting = true;
	Ecore_Thread *thread = ecore_thread_run(_register_run, _register_end, _register_end, registration);
	registration->starting = false;
	if (!thread || registration->finished) {
		registration->finished = true;
		registration->delivery = ecore_job_add(_register_delivery_job, registration);
	}
	return registration;
}

void ie_save_register_abandon(Ie_Save_Registration *registration)
{
	if (!registration)
		return;
	if (registration->delivery) {
		ecore_job_del(registration->delivery);
		free(registration->path);
		free(registration);
		return;
	}
	registration->abandoned = true;
}
