/* Saving: the choice of the new name, the free-space check on the right
 * storage, and writes that never replace, damage or leave behind a file. */
#include <ie-test-harness.h>

#include <platform_log.h>
#include <media_db.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <set>
#include <sys/mount.h>
#include <unistd.h>

#include <jpeglib.h>

#include "ie-save-private.h"
#include "ie-save.h"

namespace fs = std::filesystem;

namespace {

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

	std::string path = save(64, 48);
	EXPECT_EQ(path, dir + "/a_e003.jpg");
	EXPECT_EQ(entries(dir), (std::set<std::string>{"a.png", "a_e001.jpg", "a_e002.jpg", "a_e003.jpg"}));
	EXPECT_EQ(read_bytes(source), source_bytes);
	EXPECT_EQ(read_bytes(dir + "/a_e001.jpg"), "someone else's");
	EXPECT_FALSE(fs::exists(dir + "/nowhere"));

	Media_Db_Row record;
	ASSERT_EQ(media_db_lookup(path.c_str(), &record), MEDIA_DB_ERROR_NONE);
	EXPECT_STREQ(record.mime_type, "image/jpeg");
	EXPECT_EQ(record.width, 64);
	EXPECT_EQ(record.height, 48);
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

	// The card fills up in the middle of the JPEG; then it turns read-only.
	EXPECT_EQ(save(600, 600), "");
	ASSERT_EQ(mount(nullptr, card.c_str(), nullptr, MS_REMOUNT | MS_RDONLY, nullptr), 0);
	EXPECT_EQ(save(), "");
	EXPECT_EQ(entries(card), std::set<std::string>{"a.png"});
	EXPECT_EQ(read_bytes(source), source_bytes);
	Media_Db_Row record;
	EXPECT_NE(media_db_lookup((card + "/a_e001.jpg").c_str(), &record), MEDIA_DB_ERROR_NONE);
}

TEST_F(SaveTest, MediaDatabaseFailureKeepsTheFile)
{
	const char *db = getenv("MEDIA_DB_PATH");
	std::string saved_db = db ? db : "";
	// A database whose directory is a plain file cannot be opened.
	write_bytes(dir + "/not-a-dir", "");
	setenv("MEDIA_DB_PATH", (dir + "/not-a-dir/media.db").c_str(), 1);
	_save_init((dir + "/a.png").c_str());
	std::string path = save();
	setenv("MEDIA_DB_PATH", saved_db.c_str(), 1);
	EXPECT_TRUE(fs::exists(path));
	int warnings = 0;
	for (const iet::LogLine &line : iet::log_lines())
		warnings += line.priority == PLATFORM_LOG_WARN &&
			    line.text.find("Fail to register new edited file to DB : ") != std::string::npos;
	EXPECT_EQ(warnings, 1);
}

} // namespace
