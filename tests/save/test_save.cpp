/* Saving: the choice of the new name, the free-space check on the right
 * storage, and writes that never replace, damage or leave behind a file. */
#include <ie-test-harness.h>

#include <platform_log.h>
#include <media_db.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <fcntl.h>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <set>
#include <dirent.h>
#include <grp.h>
#include <pwd.h>
#include <signal.h>
#include <sys/mman.h>
#include <sys/file.h>
#include <sys/mount.h>
#include <sys/wait.h>
#include <unistd.h>

#include <jpeglib.h>
#include <random>

#include "ie-save-private.h"
#include "ie-save.h"
#include "ie-test-photo.h"

namespace fs = std::filesystem;

namespace {

struct FreeDeleter {
	void operator()(char *text) const { free(text); }
};
using CString = std::unique_ptr<char, FreeDeleter>;

std::string read_bytes(const std::string &path)
{
	std::ifstream in(path, std::ios::binary);
	return {std::istreambuf_iterator<char>(in), {}};
}

void write_bytes(const std::string &path, const std::string &bytes)
{
	std::ofstream(path, std::ios::binary) << bytes;
}

std::set<std::string> entries(const std::string &dir)
{
	std::set<std::string> names;
	for (const auto &entry : fs::directory_iterator(dir))
		names.insert(entry.path().filename().string());
	return names;
}

std::string euros(int count)
{
	std::string text;
	for (int i = 0; i < count; i++)
		text += "\u20AC";
	return text;
}

mode_t current_umask()
{
	mode_t mask = umask(0);
	umask(mask);
	return mask;
}

bool enough(unsigned long bsize, fsblkcnt_t bavail)
{
	struct statvfs st = {};
	st.f_bsize = bsize;
	st.f_bavail = bavail;
	return ie_save_free_space_enough(&st);
}

class SaveTest : public iet::EflTest {
protected:
	void SetUp() override
	{
		iet::EflTest::SetUp();
		dir = iet::temp_dir();
		const char *root = getenv("STORAGE_INTERNAL_ROOT");
		internal_root = root ? root : "";
	}

	void TearDown() override
	{
		for (auto it = mounts.rbegin(); it != mounts.rend(); ++it)
			umount2(it->c_str(), MNT_DETACH);
		std::error_code ignored;
		if (!created_dir.empty())
			fs::remove_all(created_dir, ignored);
		setenv("STORAGE_INTERNAL_ROOT", internal_root.c_str(), 1);
		ie_save_unnamed_files_set(EINA_TRUE);
		iet::EflTest::TearDown();
	}

	bool mount_tmpfs(const std::string &target, const std::string &size)
	{
		bool mounted = mount("tmpfs", target.c_str(), "tmpfs", 0, ("size=" + size).c_str()) == 0;
		if (mounted)
			mounts.push_back(target);
		return mounted;
	}

	/* A picture whose pixels follow a hash (noisy: JPEG hardly compresses it). */
	Evas_Object *picture(int w, int h)
	{
		Evas_Object *img = evas_object_image_filled_add(evas());
		evas_object_image_size_set(img, w, h);
		auto *pixels = static_cast<uint32_t *>(evas_object_image_data_get(img, EINA_TRUE));
		for (int i = 0; i < w * h; i++)
			pixels[i] = 0xff000000u | ((static_cast<uint32_t>(i) * 2654435761u) >> 8);
		evas_object_image_data_set(img, pixels);
		evas_object_image_data_update_add(img, 0, 0, w, h);
		return img;
	}

	/* Saves the test picture; returns the path written, or "" on failure. */
	std::string save(int w = 16, int h = 16, bool expect_full = false)
	{
		Eina_Bool memory_full = EINA_FALSE;
		char *path = _save_to_file(picture(w, h), &memory_full);
		EXPECT_EQ(bool(memory_full), expect_full);
		std::string saved = path ? path : "";
		free(path);
		return saved;
	}

	static int error_lines_naming(const std::string &text)
	{
		int count = 0;
		for (const iet::LogLine &line : iet::log_lines())
			count += line.priority == PLATFORM_LOG_ERROR && line.text.find(text) != std::string::npos;
		return count;
	}

	std::string dir, internal_root, created_dir;
	std::vector<std::string> mounts;
};

#define SKIP_WITHOUT_MOUNT(ok) \
	if (!(ok)) \
	GTEST_SKIP() << "cannot mount a tmpfs here (needs root and CAP_SYS_ADMIN): " << strerror(errno)

TEST_F(SaveTest, PicksFirstFreeCounterBesideSourceCuttingLongNames)
{
	const std::pair<std::string, std::string> cases[] = {
		{"a.png", "a_e001.jpg"},
		{"holiday", "holiday_e001.jpg"},
		{std::string(239, 'x') + ".png", std::string(239, 'x') + "_e001.jpg"},
		{std::string(240, 'y') + ".png", std::string(234, 'y') + "_e001.jpg"},
		// A name that is all extension is the whole base name.
		{".jpg", ".jpg_e001.jpg"},
		{".photo", ".photo_e001.jpg"},
		// The cut never splits a character: 1 + 80 x 3 bytes cut to 232.
		{"a" + euros(80) + ".png", "a" + euros(77) + "_e001.jpg"},
	};
	for (const auto &[source, expected] : cases) {
		_save_init((dir + "/" + source).c_str());
		EXPECT_EQ(ie_save_path_get(), dir + "/" + expected);
	}
	write_bytes(dir + "/a_e001.jpg", "1");
	write_bytes(dir + "/a_e002.jpg", "2");
	_save_init((dir + "/a.png").c_str());
	EXPECT_EQ(ie_save_path_get(), dir + "/a_e003.jpg");
}

TEST_F(SaveTest, FreeSpaceBoundaryAndLargeStorages)
{
	EXPECT_TRUE(enough(1, 1242880));
	EXPECT_FALSE(enough(1, 1242879));
	// 4 GiB and 16 GiB + 64 KiB: a 32-bit product would wrap to 0 and 65536.
	EXPECT_TRUE(enough(4096, 1u << 20));
	EXPECT_TRUE(enough(65536, (1u << 18) + 1));
}

TEST_F(SaveTest, InternalStorageJustAboveAndBelowTheMinimum)
{
	std::string storage = dir + "/internal";
	fs::create_directory(storage);
	setenv("STORAGE_INTERNAL_ROOT", storage.c_str(), 1);
	_save_init((dir + "/a.png").c_str());
	struct statvfs st;

	// tmpfs counts in 4 KiB blocks: 304 blocks = 1,245,184 bytes, 303 = 1,241,088.
	SKIP_WITHOUT_MOUNT(mount_tmpfs(storage, "1216k"));
	EXPECT_TRUE(get_internal_memory_status(&st));
	umount2(storage.c_str(), MNT_DETACH);
	mounts.clear();

	ASSERT_TRUE(mount_tmpfs(storage, "1212k"));
	iet::log_clear();
	EXPECT_FALSE(get_internal_memory_status(&st));
	EXPECT_EQ(iet::log_count("Memory is almost full < 1MB", PLATFORM_LOG_ERROR), 1);
	EXPECT_EQ(save(32, 32, true), "");
	EXPECT_EQ(iet::log_count("Out of memory", PLATFORM_LOG_ERROR), 1);
	EXPECT_EQ(entries(dir), std::set<std::string>{"internal"});
}

TEST_F(SaveTest, SdcardPathsAreMeasuredOnTheCard)
{
	fs::path top = IE_SAVE_SDCARD_ROOT;
	while (!fs::exists(top.parent_path()))
		top = top.parent_path();
	if (fs::create_directories(IE_SAVE_SDCARD_ROOT))
		created_dir = top.string();
	SKIP_WITHOUT_MOUNT(mount_tmpfs(IE_SAVE_SDCARD_ROOT, "1m"));
	struct statvfs st;

	// The internal storage (the scratch home) has plenty of room; the card does not.
	_save_init(IE_SAVE_SDCARD_ROOT "/DCIM/a.jpg");
	EXPECT_FALSE(get_internal_memory_status(&st));
	// A sibling whose name merely starts like the card is internal storage.
	_save_init(IE_SAVE_SDCARD_ROOT "1/DCIM/a.jpg");
	EXPECT_TRUE(get_internal_memory_status(&st));
	_save_init((dir + "/a.jpg").c_str());
	EXPECT_TRUE(get_internal_memory_status(&st));
}

/* Names taken after loading, even by a dangling link, are skipped; the
 * JPEG lands beside the source and is registered. */
TEST_F(SaveTest, WritesAFreshJpegWithoutReplacingAnything)
{
	std::string source = dir + "/a.png";
	ASSERT_TRUE(iet::write_picture(source, 40, 30));
	std::string source_bytes = read_bytes(source);
	_save_init(source.c_str());
	write_bytes(dir + "/a_e001.jpg", "someone else's");
	ASSERT_EQ(symlink((dir + "/nowhere").c_str(), (dir + "/a_e002.jpg").c_str()), 0);

	Evas_Object *img = picture(64, 48);
	Eina_Bool memory_full = EINA_FALSE;
	CString saved(_save_to_file(img, &memory_full));
	ASSERT_NE(saved, nullptr);
	std::string path = saved.get();
	// Still opaque: a later save must not take it for a picture with alpha.
	EXPECT_FALSE(evas_object_image_alpha_get(img));
	EXPECT_EQ(path, dir + "/a_e003.jpg");
	EXPECT_EQ(entries(dir), (std::set<std::string>{"a.png", "a_e001.jpg", "a_e002.jpg", "a_e003.jpg"}));
	EXPECT_EQ(read_bytes(source), source_bytes);
	EXPECT_EQ(read_bytes(dir + "/a_e001.jpg"), "someone else's");
	EXPECT_FALSE(fs::exists(dir + "/nowhere"));
	struct stat st;
	ASSERT_EQ(stat(path.c_str(), &st), 0);
	EXPECT_EQ(st.st_mode & 0777, 0666u & ~current_umask()) << "the mode of any new file";
}

/* The picture is written with the saver's own default quality (80): its
 * quantisation tables are libjpeg's standard tables at that quality. */
TEST_F(SaveTest, WritesWithTheSaversDefaultQuality)
{
	_save_init((dir + "/q.png").c_str());
	std::string path = save(64, 48);
	ASSERT_FALSE(path.empty());

	FILE *file = fopen(path.c_str(), "rb");
	ASSERT_NE(file, nullptr);
	jpeg_decompress_struct saved;
	jpeg_error_mgr saved_errors;
	saved.err = jpeg_std_error(&saved_errors);
	jpeg_create_decompress(&saved);
	jpeg_stdio_src(&saved, file);
	ASSERT_EQ(jpeg_read_header(&saved, TRUE), JPEG_HEADER_OK);

	jpeg_compress_struct reference;
	jpeg_error_mgr reference_errors;
	reference.err = jpeg_std_error(&reference_errors);
	jpeg_create_compress(&reference);
	reference.in_color_space = JCS_RGB;
	reference.input_components = 3;
	jpeg_set_defaults(&reference);
	jpeg_set_quality(&reference, 80, TRUE);
	for (int table = 0; table < 2; table++) {
		ASSERT_NE(saved.quant_tbl_ptrs[table], nullptr);
		for (int i = 0; i < DCTSIZE2; i++)
			EXPECT_EQ(saved.quant_tbl_ptrs[table]->quantval[i], reference.quant_tbl_ptrs[table]->quantval[i])
				<< "table " << table << " entry " << i;
	}
	jpeg_destroy_compress(&reference);
	jpeg_destroy_decompress(&saved);
	fclose(file);
}

TEST_F(SaveTest, WritesNothingWhileNoNameIsPossible)
{
	for (int counter = 1; counter <= 998; counter++) {
		char name[32];
		snprintf(name, sizeof(name), "/a_e%03d.jpg", counter);
		write_bytes(dir + name, name);
	}
	std::string deep = dir;
	while (deep.size() < 500)
		deep += "/" + std::string(60, 'd');
	fs::create_directories(deep);

	for (const std::string &source : {dir + "/a.png", deep + "/a.png", std::string()}) {
		_save_init(source.c_str());
		EXPECT_STREQ(ie_save_path_get(), "") << source;
		EXPECT_EQ(save(), "") << source;
	}
	EXPECT_EQ(entries(dir).size(), 999u);
	EXPECT_EQ(read_bytes(dir + "/a_e001.jpg"), "/a_e001.jpg");
	EXPECT_TRUE(fs::is_empty(deep));
	EXPECT_FALSE(fs::exists("/.jpg"));

	// A name freed after loading is taken at save time.
	_save_init((dir + "/a.png").c_str());
	fs::remove(dir + "/a_e500.jpg");
	EXPECT_EQ(save(), dir + "/a_e500.jpg");
}

TEST_F(SaveTest, FailedWritesLeaveTheDirectoryAsItWas)
{
	std::string card = dir + "/card";
	fs::create_directory(card);
	SKIP_WITHOUT_MOUNT(mount_tmpfs(card, "64k"));
	std::string source = card + "/a.png";
	ASSERT_TRUE(iet::write_picture(source, 16, 16));
	std::string source_bytes = read_bytes(source);
	_save_init(source.c_str());
	allow_efl_error("Image save failed.");

	// The card fills up in the middle of the JPEG: that is a full storage.
	iet::log_clear();
	EXPECT_EQ(save(600, 600, true), "");
	EXPECT_EQ(error_lines_naming(strerror(ENOSPC)), 1);
	EXPECT_EQ(entries(card), std::set<std::string>{"a.png"});
	// Turned read-only, it is another failure, logged once with its cause.
	ASSERT_EQ(mount(nullptr, card.c_str(), nullptr, MS_REMOUNT | MS_RDONLY, nullptr), 0);
	iet::log_clear();
	EXPECT_EQ(save(), "");
	EXPECT_EQ(error_lines_naming(strerror(EROFS)), 1);
	EXPECT_EQ(iet::log_lines().size(), 1u);
	EXPECT_EQ(entries(card), std::set<std::string>{"a.png"});
	EXPECT_EQ(read_bytes(source), source_bytes);
	Media_Db_Row record;
	EXPECT_NE(media_db_lookup((card + "/a_e001.jpg").c_str(), &record), MEDIA_DB_ERROR_NONE);
}

/* Registration runs off the main loop and reports back on it, once, with
 * the path; a refused registration is logged and keeps the file. */
TEST_F(SaveTest, RegistrationReportsBackOnTheMainLoop)
{
	_save_init((dir + "/a.png").c_str());
	std::string path = save(40, 30);
	ASSERT_FALSE(path.empty());
	std::vector<std::string> delivered;
	auto collect = [](void *data, char *saved) {
		static_cast<std::vector<std::string> *>(data)->push_back(saved);
		free(saved);
	};
	ie_save_register(strdup(path.c_str()), collect, &delivered);
	EXPECT_TRUE(delivered.empty()) << "never before ie_save_register returns";
	ASSERT_TRUE(iet::run_until([&] { return !delivered.empty(); }));
	iet::run_for(0.05);
	EXPECT_EQ(delivered, std::vector<std::string>{path});
	Media_Db_Row record;
	ASSERT_EQ(media_db_lookup(path.c_str(), &record), MEDIA_DB_ERROR_NONE);
	EXPECT_STREQ(record.mime_type, "image/jpeg");
	EXPECT_EQ(record.width, 40);
	EXPECT_EQ(record.height, 30);
	EXPECT_EQ(iet::log_count("Fail to register new edited file to DB : " +
				 std::to_string(MEDIA_DB_ERROR_DB_FAILED), PLATFORM_LOG_WARN), 0);

	// A database whose directory is a plain file cannot be opened.
	const char *db = getenv("MEDIA_DB_PATH");
	std::string saved_db = db ? db : "";
	write_bytes(dir + "/not-a-dir", "");
	setenv("MEDIA_DB_PATH", (dir + "/not-a-dir/media.db").c_str(), 1);
	delivered.clear();
	ie_save_register(strdup(path.c_str()), collect, &delivered);
	EXPECT_TRUE(iet::run_until([&] { return !delivered.empty(); }));
	setenv("MEDIA_DB_PATH", saved_db.c_str(), 1);
	EXPECT_EQ(delivered, std::vector<std::string>{path});
	EXPECT_TRUE(fs::exists(path));
	EXPECT_EQ(iet::log_count("Fail to register new edited file to DB : " +
				 std::to_string(MEDIA_DB_ERROR_DB_FAILED), PLATFORM_LOG_WARN), 1);

	// Abandoned: the callback never runs, nothing leaks.
	ie_save_register_abandon(ie_save_register(strdup(path.c_str()), collect, &delivered));
	iet::run_for(1.0);
	EXPECT_EQ(delivered.size(), 1u);
}

/* Another user who can write to the folder, as fast as it can: every name
 * it sees appear there is swapped for a symlink to the source or to a
 * victim file, and after each published copy it plants a symlink to the
 * victim at the next counter. Counts what it did in `attacks` (shared). */
pid_t start_racer(const std::string &folder, const std::string &stem, const std::string &source,
		  const std::string &victim, unsigned *attacks)
{
	pid_t pid = fork();
	if (pid != 0)
		return pid;
	alarm(120);
	if (chdir(folder.c_str()) != 0)
		_exit(2);
	// Root may enter any directory, a private one included; the attacker
	// this guards against is another user, so a root test races as nobody.
	if (geteuid() == 0) {
		const passwd *nobody = getpwnam("nobody");
		if (!nobody || setgroups(0, nullptr) != 0 || setgid(nobody->pw_gid) != 0 || setuid(nobody->pw_uid) != 0)
			_exit(3);
	}
	const std::string source_name = fs::path(source).filename();
	for (unsigned round = 0;; round++) {
		DIR *listing = opendir(".");
		if (!listing)
			_exit(4);
		while (dirent *entry = readdir(listing)) {
			std::string name = entry->d_name;
			if (name == "." || name == ".." || name == source_name || name.find("~moved") != std::string::npos)
				continue;
			int counter = 0;
			char tail = 0;
			if (sscanf(name.c_str() + std::min(name.size(), stem.size()), "_e%3d.jp%c", &counter, &tail) == 2 &&
			    name.compare(0, stem.size(), stem) == 0) {
				char next[64];
				snprintf(next, sizeof(next), "_e%03d.jpg", counter + 1);
				struct stat st;
				if (lstat(name.c_str(), &st) == 0 && S_ISREG(st.st_mode) &&
				    symlink(victim.c_str(), (stem + next).c_str()) == 0)
					__atomic_add_fetch(attacks, 1, __ATOMIC_RELAXED);
				continue;
			}
			std::string moved = name + "." + std::to_string(round) + "~moved";
			if (rename(name.c_str(), moved.c_str()) == 0 &&
			    symlink((round & 1 ? source : victim).c_str(), name.c_str()) == 0)
				__atomic_add_fetch(attacks, 1, __ATOMIC_RELAXED);
		}
		closedir(listing);
	}
}

/* Nothing the save creates may be reached by a name another process can
 * swap: the racer never gets the saver to write through its links, with
 * unnamed files or in a private directory. */
TEST_F(SaveTest, ARacingProcessCannotRedirectTheWrite)
{
	std::string folder = dir + "/shared";
	fs::create_directory(folder);
	// On a tmpfs where one can be mounted: flushing to a disk only slows
	// the race down.
	mount_tmpfs(folder, "16m");
	chmod(folder.c_str(), 0777);
	std::string source = folder + "/a.png", victim = dir + "/victim";
	ASSERT_TRUE(iet::write_picture(source, 24, 16));
	write_bytes(victim, "precious");
	std::string source_bytes = read_bytes(source);
	auto *attacks = static_cast<unsigned *>(
		mmap(nullptr, sizeof(unsigned), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0));
	ASSERT_NE(attacks, MAP_FAILED);
	allow_efl_error("Image save failed.");
	Evas_Object *img = picture(32, 24);

	for (Eina_Bool unnamed : {EINA_TRUE, EINA_FALSE}) {
		SCOPED_TRACE(unnamed ? "unnamed files" : "private directory");
		ie_save_unnamed_files_set(unnamed);
		*attacks = 0;
		pid_t racer = start_racer(folder, "a", source, victim, attacks);
		ASSERT_GT(racer, 0);
		std::vector<std::string> saved;
		int failed = 0;
		// Unnamed files leave it only the published names to plant links by.
		const unsigned enough_attacks = unnamed ? 1u : 51u;
		// A busy machine may give the racer little time: saving goes on
		// past 200 until it has raced enough, within the 999 names.
		for (int i = 0; i < 200 || (i < 450 && *attacks < enough_attacks); i++) {
			_save_init(source.c_str());
			Eina_Bool memory_full = EINA_FALSE;
			CString path(_save_to_file(img, &memory_full));
			if (path)
				saved.push_back(path.get());
			else
				failed++;
		}
		kill(racer, SIGKILL);
		int status = 0;
		waitpid(racer, &status, 0);
		EXPECT_TRUE(WIFSIGNALED(status)) << "the racer stopped early: " << WEXITSTATUS(status);

		EXPECT_GE(*attacks, enough_attacks) << "the racer hardly raced";
		EXPECT_EQ(read_bytes(source), source_bytes);
		EXPECT_EQ(read_bytes(victim), "precious");
		EXPECT_GE(saved.size(), 150u) << failed << " saves failed";
		for (const std::string &path : saved) {
			struct stat st;
			ASSERT_EQ(lstat(path.c_str(), &st), 0) << path;
			EXPECT_TRUE(S_ISREG(st.st_mode)) << path << " is not the written file";
			Evas_Object *check = evas_object_image_add(evas());
			evas_object_image_file_set(check, path.c_str(), nullptr);
			int w = 0, h = 0;
			evas_object_image_size_get(check, &w, &h);
			EXPECT_EQ(w * 1000 + h, 32 * 1000 + 24) << path;
			evas_object_del(check);
			unlink(path.c_str());
		}
	}
	munmap(attacks, sizeof(unsigned));
}

/* A save killed on its way leaves nothing in the folder with unnamed
 * files. In a private directory it leaves that directory, which the next
 * save in the folder removes, but never one that a live save holds. */
TEST_F(SaveTest, SavesKilledOnTheirWayLeaveNothingBehind)
{
	std::string source = dir + "/a.png";
	ASSERT_TRUE(iet::write_picture(source, 16, 16));
	Evas_Object *big = picture(1200, 900);
	auto work_dirs = [this] {
		std::set<std::string> found;
		for (const std::string &name : entries(dir))
			if (name.compare(0, strlen(IE_SAVE_WORK_DIR_PREFIX), IE_SAVE_WORK_DIR_PREFIX) == 0)
				found.insert(name);
		return found;
	};
	auto held_by_another = [this](const std::string &name) {
		int fd = open((dir + "/" + name).c_str(), O_RDONLY | O_DIRECTORY);
		bool held = fd >= 0 && flock(fd, LOCK_EX | LOCK_NB) != 0;
		if (fd >= 0)
			close(fd);
		return held;
	};
	auto save_in_child = [&] {
		pid_t pid = fork();
		if (pid == 0) {
			alarm(30);
			_save_init(source.c_str());
			Eina_Bool memory_full = EINA_FALSE;
			_exit(_save_to_file(big, &memory_full) ? 0 : 1);
		}
		return pid;
	};

	// The kills fall within a save's own length on this machine: a fixed
	// span missed nearly every save on a machine where they were quick.
	auto microseconds_since = [](const std::chrono::steady_clock::time_point &start) {
		return std::chrono::duration_cast<std::chrono::microseconds>(std::chrono::steady_clock::now() - start).count();
	};
	long save_length = 1;
	for (int run = 0; run < 3; run++) {
		auto start = std::chrono::steady_clock::now();
		pid_t child = save_in_child();
		ASSERT_GT(child, 0);
		waitpid(child, nullptr, 0);
		save_length = std::max<long>(save_length, microseconds_since(start));
	}

	// Kills saves at random points until `wanted` of them left something
	// besides whole pictures, or `count` were killed; returns how many did.
	// Each save clears what the one killed before it left.
	std::mt19937 rng(7);
	auto kill_saves = [&](int count, int wanted) {
		int left_behind = 0;
		for (int kill_count = 0; kill_count < count && left_behind < wanted; kill_count++) {
			auto start = std::chrono::steady_clock::now();
			pid_t child = save_in_child();
			EXPECT_GT(child, 0);
			// The main loop's child handler cuts sleeps short; sleep on.
			long kill_at = rng() % save_length;
			for (long now = microseconds_since(start); now < kill_at; now = microseconds_since(start))
				usleep(kill_at - now);
			kill(child, SIGKILL);
			waitpid(child, nullptr, 0);
			size_t found = 0;
			for (const std::string &name : entries(dir))
				found += name[0] == '.';
			EXPECT_LE(found, 1u);
			left_behind += found != 0;
		}
		return left_behind;
	};
	EXPECT_EQ(kill_saves(10, 1), 0) << "an unnamed file went with its process";

	ie_save_unnamed_files_set(EINA_FALSE);
	ASSERT_EQ(kill_saves(100, 3), 3) << "too few kills landed inside a save";

	// Stop a live save while it holds its directory.
	std::string held;
	pid_t holder = -1;
	for (int attempt = 0; attempt < 20 && held.empty(); attempt++) {
		holder = save_in_child();
		for (int poll = 0; poll < 5000 && held.empty(); poll++) {
			for (const std::string &name : work_dirs())
				if (held_by_another(name)) {
					kill(holder, SIGSTOP);
					if (held_by_another(name))
						held = name;
					else
						kill(holder, SIGCONT);
					break;
				}
			usleep(100);
		}
		if (held.empty())
			waitpid(holder, nullptr, 0);
	}
	ASSERT_FALSE(held.empty()) << "no save was caught holding its directory";

	_save_init(source.c_str());
	EXPECT_NE(save(), "");
	EXPECT_EQ(work_dirs(), std::set<std::string>{held});
	kill(holder, SIGCONT);
	int status = -1;
	waitpid(holder, &status, 0);
	EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << "the held save went on to succeed";
	EXPECT_TRUE(work_dirs().empty());
	// Only whole pictures were ever published.
	for (const std::string &name : entries(dir)) {
		if (name == "a.png")
			continue;
		std::string bytes = read_bytes(dir + "/" + name);
		EXPECT_EQ(bytes.substr(bytes.size() - 2), "\xFF\xD9") << name;
	}
}

/* Metadata comes only from a JPEG source; a damaged EXIF block is left
 * out with a warning, and the colour profile still goes. */
TEST_F(SaveTest, MetadataOnlyFromWhatTheSourceCarriesReadably)
{
	auto markers = [](const std::string &path) {
		std::vector<int> found;
		for (const iet::Segment &segment : iet::jpeg_segments(path))
			if (segment.marker >= 0xE0 && segment.marker <= 0xEF)
				found.push_back(segment.marker);
		return found;
	};
	std::string png = dir + "/plain.png";
	ASSERT_TRUE(iet::write_picture(png, 32, 24));
	_save_init(png.c_str());
	std::string from_png = save(32, 24);
	EXPECT_EQ(markers(from_png), std::vector<int>{0xE0}) << "the encoder's JFIF header alone";

	std::string damaged = dir + "/damaged.jpg";
	ASSERT_TRUE(iet::write_photo(damaged, 32, 24, 6));
	std::string bytes = read_bytes(damaged);
	size_t tiff = bytes.find(std::string("Exif\0\0", 6)) + 6;
	bytes.replace(tiff, 4, std::string("XX\x2A\x00", 4));
	write_bytes(damaged, bytes);
	_save_init(damaged.c_str());
	iet::log_clear();
	std::string from_damaged = save(32, 24);
	ASSERT_FALSE(from_damaged.empty());
	EXPECT_EQ(markers(from_damaged), (std::vector<int>{0xE0, 0xE2, 0xE2}));
	EXPECT_TRUE(iet::jpeg_icc_profile(from_damaged) == iet::test_icc_profile());
	EXPECT_EQ(iet::log_count("The EXIF block of " + damaged + " is damaged; saving without it", PLATFORM_LOG_WARN), 1);
}

} // namespace
