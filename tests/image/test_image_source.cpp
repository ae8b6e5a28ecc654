/* What the loader reads from a picture's bytes before any decoding: whether
 * a JPEG or PNG is whole, and the EXIF orientation wherever its block sits. */
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "ie-image-source.h"
#include "ie-test-harness.h"
#include "ie-test-pictures.h"
#include "test-jpeg-encode.h"

namespace iet {
namespace {

/* A JPEG of several scans, or with restart markers inside its data. */
Bytes libjpeg_picture(int w, int h, bool progressive, int restart)
{
	Encoding e;
	e.progressive = progressive;
	e.restart = restart;
	return encode(test_pixels(w, h, e.components, 1, 0), w, h, e);
}

Bytes saved_picture(const std::string &name, int w, int h)
{
	std::string path = temp_dir() + "/" + name;
	EXPECT_TRUE(write_picture(path, w, h));
	return read_bytes(path);
}

Ie_Image_Facts facts_of(const Bytes &bytes)
{
	return ie_image_facts_get(bytes.data(), bytes.size());
}

TEST(ImageFacts, OnlyAWholeJpegOrPngIsComplete)
{
	const Bytes jpeg = saved_picture("a.jpg", 61, 47);
	const Bytes pictures[] = {
		jpeg,
		jpeg_with_segments(jpeg, { comment_segment("a comment"), exif_segment(6, true) }, true),
		libjpeg_picture(61, 47, true, 0),
		libjpeg_picture(61, 47, false, 1),
		saved_picture("a.png", 61, 47),
	};
	const Bytes trailer = { 0xFF, 0xD8, 0xFF, 0x00, 'I', 'E', 'N', 'D', 0xFF };
	for (const Bytes &whole : pictures) {
		SCOPED_TRACE(std::to_string(whole.size()) + " bytes");
		/* From the first bytes that tell the format. */
		for (size_t cut = 8; cut < whole.size(); cut++)
			ASSERT_FALSE(ie_image_facts_get(whole.data(), cut).complete) << "cut at " << cut;
		EXPECT_TRUE(facts_of(whole).complete);
		Bytes trailed = whole;
		trailed.insert(trailed.end(), trailer.begin(), trailer.end());
		EXPECT_TRUE(facts_of(trailed).complete);
	}

	/* Other formats are the decoder's to judge. */
	const Bytes gif_start = { 'G', 'I', 'F', '8', '9', 'a', 1, 0 };
	EXPECT_TRUE(facts_of(gif_start).complete);
	EXPECT_TRUE(facts_of({}).complete);
}

TEST(ImageFacts, OrientationWhereverTheExifBlockSits)
{
	const Bytes jpeg = saved_picture("b.jpg", 16, 8);
	const std::string xmp_text = std::string("http://ns.adobe.com/xap/1.0/") + '\0' + "<x:xmpmeta/>";
	Bytes xmp = { 0xFF, 0xE1, 0, uint8_t(xmp_text.size() + 2) };
	xmp.insert(xmp.end(), xmp_text.begin(), xmp_text.end());
	for (int orientation = 1; orientation <= 8; orientation++)
		for (bool big_endian : { false, true }) {
			const Bytes exif = exif_segment(orientation, big_endian);
			const Bytes layouts[] = {
				jpeg_with_segments(jpeg, { exif }, false),
				jpeg_with_segments(jpeg, { exif }, true),
				jpeg_with_segments(jpeg, { comment_segment("first"), exif }, true),
				jpeg_with_segments(jpeg, { xmp, comment_segment("first"), exif }, true),
				/* The first block counts. */
				jpeg_with_segments(jpeg, { exif, exif_segment(orientation % 8 + 1, !big_endian) }, true),
			};
			for (const Bytes &bytes : layouts) {
				Ie_Image_Facts facts = facts_of(bytes);
				EXPECT_TRUE(facts.complete);
				EXPECT_EQ(facts.orientation, orientation) << (big_endian ? "big" : "little") << "-endian";
			}
		}

	/* No block, a value outside 1 to 8, a block cut short inside its
	 * segment: shown as stored. */
	Bytes cut_exif = exif_segment(6, false);
	cut_exif.resize(4 + 14);
	cut_exif[2] = 0;
	cut_exif[3] = 16;
	for (const Bytes &bytes : { jpeg, jpeg_with_segments(jpeg, { exif_segment(0, false) }, true),
				    jpeg_with_segments(jpeg, { exif_segment(9, true) }, true),
				    jpeg_with_segments(jpeg, { cut_exif }, true) }) {
		Ie_Image_Facts facts = facts_of(bytes);
		EXPECT_TRUE(facts.complete);
		EXPECT_EQ(facts.orientation, 1);
	}
}

} // namespace
} // namespace iet
