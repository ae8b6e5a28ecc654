/* Picture loading with real files: as is, resampled at once, or decoded in
 * the background behind the processing popup; EXIF orientation; and the
 * files that cannot be loaded. */
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <climits>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <vector>

#include <isa-l/crc.h>

#include "ie-test-pictures.h"
#include "image_test_fixture.h"

namespace iet {
namespace {

/* A file Evas cannot save. */
bool write_flat_gif(const std::string &path, int w, int h, uint32_t rgb)
{
	auto lo = [](int v) { return uint8_t(v); };
	auto hi = [](int v) { return uint8_t(v >> 8); };
	Bytes b = { 'G', 'I', 'F', '8', '9', 'a', lo(w), hi(w), lo(h), hi(h), 0x91, 0, 0, /* 4 colours */
		    uint8_t(rgb >> 16), uint8_t(rgb >> 8), uint8_t(rgb), 0, 0, 0, 0, 0, 0, 0, 0, 0,
		    0x2c, 0, 0, 0, 0, lo(w), hi(w), lo(h), hi(h), 0, 2 /* no local table, 2-bit LZW */ };
	/* Uncompressed LZW: a clear code (4) before every second pixel keeps
	 * the codes 3 bits wide; 5 ends the data. */
	Bytes data;
	uint32_t bits = 0;
	int count = 0;
	auto emit = [&](uint32_t code) {
		bits |= code << count;
		for (count += 3; count >= 8; count -= 8, bits >>= 8)
			data.push_back(bits & 0xff);
	};
	for (size_t i = 0; i < (size_t)w * h; i++) {
		if (i % 2 == 0)
			emit(4);
		emit(0);
	}
	emit(5);
	if (count > 0)
		data.push_back(bits & 0xff);
	for (size_t at = 0; at < data.size(); at += 255) {
		size_t n = std::min<size_t>(255, data.size() - at);
		b.push_back((uint8_t)n);
		b.insert(b.end(), data.begin() + at, data.begin() + at + n);
	}
	b.insert(b.end(), { 0, 0x3b });
	return write_bytes(path, b);
}

/* A JPEG or PNG whose header claims w x h (the PNG's CRC kept right):
 * the data is the original's, far too little for that size. */
Bytes claiming_size(Bytes file, int w, int h)
{
	auto put16 = [&](size_t at, int v) {
		file[at] = uint8_t(v >> 8);
		file[at + 1] = uint8_t(v);
	};
	if (file[0] == 0xFF) {
		size_t sof = 2;
		while (file[sof + 1] != 0xC0 && file[sof + 1] != 0xC2)
			sof += 2 + (size_t(file[sof + 2]) << 8 | file[sof + 3]);
		put16(sof + 5, h);
		put16(sof + 7, w);
		return file;
	}
	/* IHDR: the first chunk, at 8; its data at 16, its CRC at 29. */
	put16(16, w >> 16);
	put16(18, w);
	put16(20, h >> 16);
	put16(22, h);
	const uint32_t crc = crc32_gzip_refl(0, &file[12], 17);
	for (int i = 0; i < 4; i++)
		file[29 + size_t(i)] = uint8_t(crc >> (24 - 8 * i));
	return file;
}

constexpr uint32_t MARK = 0xffffff;

/* In a 100 x 100 box, pictures small enough to write quickly still take
 * each way in: as they are, resampled from the decoder's half size, and
 * decoded at a third in the background. The reduced ones come to 100 x 75. */
constexpr int SMALL_BOX = 100;
struct Way_In {
	const char *name;
	int w, h;
	bool reduced, background;
};
constexpr Way_In WAYS_IN[] = { { "as is", 64, 48, false, false },
			       { "resampled", 240, 180, true, false },
			       { "in the background", 360, 270, true, true } };

void count_call(void *data, Evas_Object *, void *) { ++*static_cast<int *>(data); }
void count_del(void *data, Evas *, Evas_Object *, void *) { ++*static_cast<int *>(data); }

class MainImageLoad : public MainImageTest {
protected:
	void SetUp() override
	{
		MainImageTest::SetUp();
		/* The theme may not be built in this tree; the popup survives it. */
		allow_efl_error("processing_view_layout");
	}

	/* Into a new object, with nothing cached: background loads must not
	 * find the picture decoded already. */
	Eina_Bool load(const std::string &path, int box_w = 720, int box_h = 1280)
	{
		add_image();
		evas_image_cache_flush(evas());
		return ie_image_file_load(obj_, path.c_str(), box_w, box_h);
	}

	/* A background load on a busy machine may take a while: the wait ends
	 * as soon as the pixels are in. */
	bool wait_for_pixels()
	{
		return run_until([this] { return pixel_size().w > 0 && !sd()->processing_popup; }, 30.0);
	}

	/* Deletions of the loading popup, counted in the fixture so that a
	 * test that fails while the popup lives leaves it nothing to write to
	 * in a finished test's frame. */
	int popups_deleted = 0;

	/* JPEG and resampling blur colours a little. */
	void expect_colour(int x, int y, uint32_t rgb, int tolerance = 28)
	{
		auto *pixels = static_cast<const uint32_t *>(ie_image_data_get(obj_));
		ASSERT_TRUE(pixels && x < pixel_size().w && y < pixel_size().h) << "no pixel at " << x << ", " << y;
		uint32_t p = pixels[(size_t)y * pixel_size().w + x];
		for (int shift : { 16, 8, 0 })
			EXPECT_NEAR(int(p >> shift & 0xff), int(rgb >> shift & 0xff), tolerance) << x << ", " << y;
	}

	/* write_picture's gradient, upright and in its own colours: the mark at
	 * the top left, red at the top right. */
	void expect_upright()
	{
		expect_colour(1, 1, MARK);
		expect_colour(pixel_size().w - 1, 0, 0xff0060);
	}

	int load_errors() const
	{
		std::vector<std::string> lines = log_messages();
		return (int)std::count_if(lines.begin(), lines.end(), [](const std::string &line) {
			return line.rfind("could not load image. error string is \"", 0) == 0;
		});
	}
};

TEST_F(MainImageLoad, ReducesToTheBoxAtOnceOrBehindThePopup)
{
	std::string gif = scratch_path("flat.gif");
	ASSERT_TRUE(write_flat_gif(gif, 1500, 1000, 0xc83214));
	auto turned = [this](int w, int h, int orientation) {
		std::string path = scratch_path("turned-" + std::to_string(w) + "-" + std::to_string(orientation) + ".jpg");
		EXPECT_TRUE(write_oriented_jpeg(path, w, h, orientation, false, true));
		return path;
	};
	std::string progressive = scratch_path("progressive.jpg");
	ASSERT_TRUE(write_progressive_jpeg(progressive, 4000, 3000));
	/* Reduced by less than half: full-size chroma, which our progressive
	 * decoding leaves to libjpeg. */
	std::string progressive_double = scratch_path("progressive-double.jpg");
	ASSERT_TRUE(write_progressive_jpeg(progressive_double, 2000, 1500));
	/* At once; in the background on the worker (JPEG and PNG, decoded by
	 * us); in the background in Evas's offscreen canvas (anything else,
	 * and GIF or WBMP by name), with its decoder's scale-down. */
	enum Way { AT_ONCE, WORKER, OFFSCREEN };
	struct Case {
		std::string path;
		int w, h;
		Way way;
		int scale_down;
		int orientation;
	} cases[] = {
		{ picture("small.jpg", 640, 480), 640, 480, AT_ONCE, 0, 1 },
		{ picture("double.jpg", 2000, 1500), 1280, 960, AT_ONCE, 0, 1 },
		{ picture("triple.jpg", 3000, 2000), 1280, 853, AT_ONCE, 0, 1 },
		{ picture("triple.png", 3000, 2000), 1280, 853, AT_ONCE, 0, 1 },
		{ picture("large.jpg", 4000, 3000), 1280, 960, WORKER, 0, 1 },
		{ picture("large.png", 4000, 3000), 1280, 960, WORKER, 0, 1 },
		{ progressive, 1280, 960, WORKER, 0, 1 },
		{ progressive_double, 1280, 960, AT_ONCE, 0, 1 },
		{ gif, 1280, 853, OFFSCREEN, 0, 1 },
		/* Named like a GIF anywhere in the path: treated as one. */
		{ picture("photo.gif.jpg", 2000, 1500), 1280, 960, OFFSCREEN, 0, 1 },
		{ turned(640, 480, 6), 480, 640, AT_ONCE, 0, 6 },
		{ turned(640, 480, 8), 480, 640, AT_ONCE, 0, 8 },
		{ turned(2000, 1500, 6), 960, 1280, AT_ONCE, 0, 6 },
		{ turned(4000, 3000, 8), 960, 1280, WORKER, 0, 8 },
	};
	for (const Case &c : cases) {
		SCOPED_TRACE(c.path);
		ASSERT_TRUE(load(c.path));
		EXPECT_TRUE(sd()->loaded && sd()->path && evas_object_visible_get(obj_));
		EXPECT_EQ(sd()->img_w, c.w);
		EXPECT_EQ(sd()->img_h, c.h);
		/* Laid out at its final size, pixels or not. */
		evas_smart_objects_calculate(evas());
		EXPECT_EQ(shown().w, 720);
		EXPECT_EQ(sd()->decode_job != nullptr, c.way == WORKER);
		EXPECT_EQ(sd()->preload_image != nullptr, c.way == OFFSCREEN);
		if (c.way == OFFSCREEN) {
			EXPECT_EQ(evas_object_image_load_scale_down_get(sd()->preload_image), c.scale_down);
		}
		if (c.way == AT_ONCE) {
			EXPECT_EQ(sd()->processing_popup, nullptr);
		} else {
			EXPECT_EQ(pixel_size().w, 0) << "no pixels before the background load completes";
			ASSERT_NE(sd()->processing_popup, nullptr);
			EXPECT_TRUE(evas_object_visible_get(sd()->processing_popup));
			evas_object_event_callback_add(sd()->processing_popup, EVAS_CALLBACK_DEL, count_del, &popups_deleted);
			ASSERT_TRUE(wait_for_pixels());
			EXPECT_EQ(popups_deleted, 1);
			EXPECT_EQ(sd()->decode_job, nullptr);
			popups_deleted = 0;
		}
		EXPECT_EQ(pixel_size(), (Rect{ 0, 0, c.w, c.h }));
		/* Every way in leaves the picture in the main image's own buffer,
		 * which the views rework in place. */
		EXPECT_TRUE(ie_image_pixels_owned(obj_, evas_object_image_data_get(sd()->image, EINA_FALSE)));
		/* 6 turns clockwise: the marked corner goes to the top right;
		 * 8 the other way: to the bottom left. */
		if (c.path == gif)
			expect_colour(c.w - 1, c.h - 1, 0xc83214, 0);
		else if (c.orientation == 6)
			expect_colour(c.w - 2, 1, MARK);
		else if (c.orientation == 8)
			expect_colour(1, c.h - 2, MARK);
		else
			expect_upright();
	}
}

/* The picture on screen is the stored picture turned as its EXIF block
 * says, wherever the block sits and in either byte order, baseline or
 * progressive: pixel for pixel when shown as is, cell for cell when
 * reduced. */
TEST_F(MainImageLoad, EveryOrientationShowsUprightOnEveryWayIn)
{
	for (const Way_In &way : WAYS_IN)
		for (int orientation = 1; orientation <= 8; orientation++)
			for (int variant = 0; variant < 5; variant++) {
				/* Each place and byte order of the block, then a
				 * progressive file (our own decoder's way in). */
				const bool comment_first = variant & 1, big_endian = variant & 2, progressive = variant == 4;
				std::string name = std::string(way.name) + "-" + std::to_string(orientation) +
						   (comment_first ? "-comment" : "") + (big_endian ? "-mm" : "-ii") +
						   (progressive ? "-progressive" : "") + ".jpg";
				SCOPED_TRACE(name);
				std::string path = scratch_path(name);
				ASSERT_TRUE(write_oriented_jpeg(path, way.w, way.h, orientation, big_endian, comment_first, progressive));
				ASSERT_TRUE(load(path, SMALL_BOX, SMALL_BOX));
				if (way.background) {
					ASSERT_TRUE(wait_for_pixels());
				}

				Pixels stored = stored_pixels(path);
				Pixels shown = image_pixels(ie_image_object_get(obj_));
				EXPECT_EQ(sd()->img_w, shown.w);
				EXPECT_EQ(sd()->img_h, shown.h);
				if (!way.reduced) {
					EXPECT_TRUE(shown == turned_upright(stored, orientation));
					continue;
				}
				EXPECT_EQ(shown.w, orientation >= 5 ? 75 : 100);
				EXPECT_EQ(shown.h, orientation >= 5 ? 100 : 75);
				/* Reducing blurs the marked corner a little; any other
				 * orientation differs by far more. */
				for (int other = 1; other <= 8; other++) {
					int difference = grid_difference(shown, turned_upright(stored, other));
					if (other == orientation) {
						EXPECT_LE(difference, 24);
					} else if ((other >= 5) == (orientation >= 5)) {
						EXPECT_GT(difference, 96) << other;
					}
				}
			}
}

/* A JPEG or PNG cut anywhere fails as any unreadable file does, whichever
 * way it would have gone in; the decoders would show it with grey or
 * missing rows and no error. Bytes after the end do not matter. */
TEST_F(MainImageLoad, CutPicturesFailOnEveryWayInAndTrailingBytesDoNot)
{
	const Bytes trailer = { 0xFF, 0xD8, 0xFF, 0xE0, 0x00, 0x10, 'n', 'o', 't', ' ', 'o', 'u', 'r', 's', 0xFF, 0xD9, 0x00 };
	for (const Way_In &way : WAYS_IN)
		for (const char *extension : { ".jpg", ".png" }) {
			std::string whole = scratch_path(way.name + std::string(extension));
			ASSERT_TRUE(write_picture(whole, way.w, way.h));
			const Bytes bytes = read_bytes(whole);
			const bool jpeg = std::string(extension) == ".jpg";
			/* In the header, in the data, just before the end marker
			 * (for PNG: without IEND, and inside it). */
			std::vector<size_t> cuts = { 20, bytes.size() / 2, bytes.size() - 2 };
			if (!jpeg)
				cuts = { 20, bytes.size() / 2, bytes.size() - 12, bytes.size() - 1 };
			/* Cut in the data and closed again with an end marker: the
			 * decoder runs out of data before the last row. */
			const size_t MENDED = 0;
			if (jpeg)
				cuts.push_back(MENDED);
			for (size_t cut : cuts) {
				std::string path = scratch_path("cut-" + std::to_string(cut) + "-" + way.name + extension);
				SCOPED_TRACE(path);
				Bytes damaged(bytes.begin(), bytes.begin() + (cut == MENDED ? bytes.size() / 2 : cut));
				if (cut == MENDED)
					damaged.insert(damaged.end(), { 0xFF, 0xD9 });
				ASSERT_TRUE(write_bytes(path, damaged));
				log_clear();
				const bool started = load(path, SMALL_BOX, SMALL_BOX);
				if (started) {
					/* Only the decoding finds this damage: in the background. */
					EXPECT_TRUE(cut == MENDED && way.background);
					EXPECT_TRUE(run_until([this] { return load_errors() > 0; }));
					run_for(0.1);
				}
				EXPECT_EQ(load_errors(), 1);
				EXPECT_TRUE((started || !sd()->loaded) && !sd()->preload_image && !sd()->processing_popup);
				EXPECT_EQ(pixel_size().w, 0);
			}

			std::string trailed = scratch_path("trailed-" + std::string(way.name) + extension);
			SCOPED_TRACE(trailed);
			Bytes with_trailer = bytes;
			with_trailer.insert(with_trailer.end(), trailer.begin(), trailer.end());
			ASSERT_TRUE(write_bytes(trailed, with_trailer));
			Pixels shown[2];
			for (int i = 0; i < 2; i++) {
				ASSERT_TRUE(load(i ? trailed : whole, SMALL_BOX, SMALL_BOX));
				if (way.background) {
					ASSERT_TRUE(wait_for_pixels());
				}
				shown[i] = image_pixels(ie_image_object_get(obj_));
			}
			EXPECT_TRUE(shown[0] == shown[1] && !shown[0].data.empty());
		}
}

/* Anything but a regular file fails at once: a FIFO would block the main
 * loop in open() for ever, a device could be read for ever. */
TEST_F(MainImageLoad, FilesThatCannotBeLoadedFailAtOnceWithOneErrorLine)
{
	std::string text = scratch_path("notes.jpg"), empty = scratch_path("empty.jpg");
	std::ofstream(text) << "not a picture\n";
	std::ofstream{ empty };
	std::string fifo = scratch_path("fifo.jpg"), folder = scratch_path("x.jpg");
	std::string zero = scratch_path("zero.jpg"), socket_path = scratch_path("socket.jpg");
	ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
	ASSERT_EQ(mkdir(folder.c_str(), 0700), 0);
	ASSERT_EQ(symlink("/dev/zero", zero.c_str()), 0);
	int listener = socket(AF_UNIX, SOCK_STREAM, 0);
	sockaddr_un address = {};
	address.sun_family = AF_UNIX;
	snprintf(address.sun_path, sizeof(address.sun_path), "%s", socket_path.c_str());
	ASSERT_EQ(bind(listener, reinterpret_cast<sockaddr *>(&address), sizeof(address)), 0);

	for (const std::string &path : { scratch_path("missing.jpg"), text, empty, fifo, folder, zero, socket_path }) {
		SCOPED_TRACE(path);
		log_clear();
		auto start = std::chrono::steady_clock::now();
		EXPECT_FALSE(load(path));
		EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(1));
		EXPECT_EQ(load_errors(), 1);
		EXPECT_TRUE(!sd()->loaded && !sd()->path && !sd()->processing_popup && !sd()->preload_image)
			<< "nothing left behind";
		EXPECT_FALSE(evas_object_visible_get(obj_) || pixel_size().w);
	}
	close(listener);
}

TEST_F(MainImageLoad, BackgroundDecodingFailureIsReportedOnceAndNotShown)
{
	std::string damaged = scratch_path("damaged.png");
	ASSERT_TRUE(write_png_with_short_data(damaged, 4000, 3000));
	ASSERT_TRUE(load(damaged));
	int failures = 0;
	evas_object_smart_callback_add(obj_, IE_IMAGE_SIGNAL_LOAD_FAILED, count_call, &failures);
	ASSERT_TRUE(run_until([&] { return failures > 0; }));
	run_for(0.1);
	EXPECT_EQ(failures, 1);
	EXPECT_EQ(load_errors(), 1);
	EXPECT_EQ(sd()->processing_popup, nullptr);
	EXPECT_EQ(pixel_size().w, 0) << "an empty render must not become the picture";

	/* A view that takes the (empty) size now: nothing to fit, nothing to
	 * divide by. */
	ie_image_size_update(obj_);
	settle();
	double_tap(win(), 360, 640);
	run_for(0.4);
	pinch(win(), 360, 640, 40, 200);
	EXPECT_EQ(sd()->img_w, 0);

	/* The owner may delete the object when told. */
	ASSERT_TRUE(load(damaged));
	evas_object_smart_callback_add(obj_, IE_IMAGE_SIGNAL_LOAD_FAILED,
		[](void *data, Evas_Object *obj, void *) {
			evas_object_del(obj);
			*static_cast<Evas_Object **>(data) = nullptr;
		}, &obj_);
	ASSERT_TRUE(run_until([&] { return obj_ == nullptr; }));
	run_for(0.2);
}

TEST_F(MainImageLoad, DeletingDuringABackgroundLoadLeavesNothingBehind)
{
	std::string path = picture("large.jpg", 4000, 3000);
	for (bool editor_first : { false, true }) {
		SCOPED_TRACE(editor_first ? "editor first" : "main image first");
		Evas_Object *editor = elm_box_add(win());
		obj_ = ie_image_add(editor);
		evas_object_resize(obj_, 720, 1280);
		evas_image_cache_flush(evas());
		ASSERT_TRUE(ie_image_file_load(obj_, path.c_str(), 720, 1280));
		ASSERT_NE(sd()->processing_popup, nullptr);
		popups_deleted = 0;
		evas_object_event_callback_add(sd()->processing_popup, EVAS_CALLBACK_DEL, count_del, &popups_deleted);
		if (editor_first) {
			/* The popup and the gesture layer die with the editor's
			 * layout; the main image must not reach for them. */
			evas_object_del(editor);
			EXPECT_EQ(sd()->processing_popup, nullptr);
			EXPECT_EQ(sd()->gesture, nullptr);
			ASSERT_TRUE(wait_for_pixels());
		}
		evas_object_del(obj_);
		obj_ = nullptr;
		EXPECT_EQ(popups_deleted, 1);
		if (!editor_first)
			evas_object_del(editor);
		run_for(0.3);
	}
}

TEST_F(MainImageLoad, BoxAndSizeExtremesNeitherOverflowNorLoseThePicture)
{
	std::string small = picture("small.png", 64, 48);
	ASSERT_TRUE(load(small, INT_MAX, INT_MAX));
	EXPECT_EQ(pixel_size(), (Rect{ 0, 0, 64, 48 }));
	EXPECT_FALSE(load(small, 0, 0));

	/* Wider than GIF's signed reading of the header: the size comes back
	 * negative and must not pass as a small picture. */
	std::string too_wide = scratch_path("too-wide.gif");
	ASSERT_TRUE(write_flat_gif(too_wide, 40000, 24, 0x102030));
	EXPECT_FALSE(load(too_wide));

	/* Headers claiming more pixels than the editor opens (400 million, a
	 * side longer than Evas takes): refused at once, whichever decoder
	 * would have taken them, before anything is decoded. */
	for (const char *name : { "huge.jpg", "huge.png", "long.jpg", "long.png" }) {
		SCOPED_TRACE(name);
		const bool long_side = name[0] == 'l';
		const int w = long_side ? 65001 : 20000, h = long_side ? 2 : 20000;
		std::string path = scratch_path(name);
		ASSERT_TRUE(write_bytes(path, claiming_size(read_bytes(picture(name, 64, 48)), w, h)));
		log_clear();
		EXPECT_FALSE(load(path));
		/* The long side Evas's own header reading refuses already. */
		EXPECT_EQ(log_count("Cannot hold a " + std::to_string(w) + "x" + std::to_string(h) +
				    " picture in a 720x1280 box") +
				  load_errors(),
			  1);
		EXPECT_TRUE(!sd()->processing_popup && !sd()->decode_thread && !sd()->preload_image);
	}

	/* Reduced to 100 wide, the short side would round to nothing. */
	ASSERT_TRUE(load(picture("strip.png", 2000, 8), 100, 100));
	ASSERT_TRUE(wait_for_pixels());
	EXPECT_EQ(pixel_size(), (Rect{ 0, 0, 100, 1 }));
}

} // namespace
} // namespace iet
