/* effect-sheet [picture] [out.png]: a contact sheet of the effect catalogue.
 * The picture is scaled to tile size and run through the editor's effect
 * dispatcher once per catalogue effect; the original and the twenty results
 * are laid out as labelled tiles on one PNG. */
#include <Ecore.h>
#include <Ecore_Evas.h>
#include <Evas.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "effect-sheet-layout.h"
#include "ie-engine.h"

#ifndef EFFECT_SHEET_DEFAULT_PICTURE
#define EFFECT_SHEET_DEFAULT_PICTURE "sample.jpg"
#endif
#ifndef EFFECT_SHEET_DEFAULT_OUTPUT
#define EFFECT_SHEET_DEFAULT_OUTPUT "effect-sheet.png"
#endif

namespace {

constexpr int FONT_SIZE = 15;
constexpr const char *FONT = "DejaVu Sans:style=Bold";

struct Picture {
	int width = 0;
	int height = 0;
	std::vector<uint8_t> bgra;

	IEL_Image record()
	{
		return IEL_Image{uint32_t(width), uint32_t(height), IEL_FORMAT_BGRA8888, bgra.data()};
	}
};

bool load_picture(Evas *evas, const char *path, Picture *picture)
{
	Evas_Object *image = evas_object_image_add(evas);
	evas_object_image_load_orientation_set(image, EINA_TRUE);
	evas_object_image_file_set(image, path, nullptr);
	bool loaded = evas_object_image_load_error_get(image) == EVAS_LOAD_ERROR_NONE;
	if (loaded) {
		evas_object_image_size_get(image, &picture->width, &picture->height);
		const auto *data = static_cast<const uint8_t *>(evas_object_image_data_get(image, EINA_FALSE));
		loaded = data && picture->width > 0 && picture->height > 0;
		if (loaded)
			picture->bgra.assign(data, data + size_t(picture->width) * size_t(picture->height) * 4);
	}
	evas_object_del(image);
	return loaded;
}

Evas_Object *add_text(Evas *evas, const char *text, int size, int centre_x, int top)
{
	Evas_Object *label = evas_object_text_add(evas);
	evas_object_text_font_set(label, FONT, size);
	evas_object_text_text_set(label, text);
	evas_object_color_set(label, 235, 235, 235, 255);
	int w = 0;
	evas_object_geometry_get(label, nullptr, nullptr, &w, nullptr);
	evas_object_move(label, centre_x - w / 2, top);
	evas_object_show(label);
	return label;
}

void add_tile(Evas *evas, const Picture &tile, const char *label, int x, int y)
{
	Evas_Object *image = evas_object_image_filled_add(evas);
	evas_object_image_size_set(image, tile.width, tile.height);
	evas_object_image_alpha_set(image, EINA_FALSE);
	evas_object_image_data_copy_set(image, const_cast<uint8_t *>(tile.bgra.data()));
	evas_object_image_data_update_add(image, 0, 0, tile.width, tile.height);
	evas_object_move(image, x, y);
	evas_object_resize(image, tile.width, tile.height);
	evas_object_show(image);
	add_text(evas, label, FONT_SIZE, x + tile.width / 2, y + tile.height + 6);
}

int run(const char *picture_path, const char *out_path)
{
	Ecore_Evas *probe = ecore_evas_buffer_new(16, 16);
	if (!probe) {
		std::fprintf(stderr, "effect-sheet: no buffer canvas\n");
		return 1;
	}
	Picture source;
	bool loaded = load_picture(ecore_evas_get(probe), picture_path, &source);
	ecore_evas_free(probe);
	if (!loaded) {
		std::fprintf(stderr, "effect-sheet: cannot load %s\n", picture_path);
		return 1;
	}

	Picture tile;
	tile.width = TILE_WIDTH;
	tile.height = std::max(1, int(double(TILE_WIDTH) * source.height / source.width + 0.5));
	tile.bgra.assign(size_t(tile.width) * size_t(tile.height) * 4, 0);
	IEL_Image source_record = source.record(), tile_record = tile.record();
	if (IEL_Resize_Image(&source_record, &tile_record) != IEL_OK) {
		std::fprintf(stderr, "effect-sheet: cannot scale %s\n", picture_path);
		return 1;
	}

	const int sheet_width = GAP + COLUMNS * (tile.width + GAP);
	const int sheet_height = GAP + ROWS * (tile.height + LABEL_HEIGHT + GAP);
	Ecore_Evas *canvas = ecore_evas_buffer_new(sheet_width, sheet_height);
	if (!canvas) {
		std::fprintf(stderr, "effect-sheet: no %dx%d canvas\n", sheet_width, sheet_height);
		return 1;
	}
	Evas *evas = ecore_evas_get(canvas);
	Evas_Object *background = evas_object_rectangle_add(evas);
	evas_object_color_set(background, 38, 38, 42, 255);
	evas_object_resize(background, sheet_width, sheet_height);
	evas_object_show(background);

	for (int i = 0; i < TILE_COUNT; ++i) {
		Picture result = tile;
		if (TILES[i].effect >= 0) {
			std::fill(result.bgra.begin(), result.bgra.end(), 0);
			IEL_Image in = tile.record(), out = result.record();
			int code = IEL_Run_Effect(&in, &out, unsigned(TILES[i].effect));
			if (code != IEL_OK)
				std::fprintf(stderr, "effect-sheet: %s failed (%d)\n", TILES[i].label, code);
		}
		int x = 0, y = 0;
		tile_origin(i, tile.width, tile.height, &x, &y);
		add_tile(evas, result, TILES[i].label, x, y);
	}

	const void *pixels = ecore_evas_buffer_pixels_get(canvas);
	Evas_Object *sheet = evas_object_image_add(evas);
	evas_object_image_size_set(sheet, sheet_width, sheet_height);
	evas_object_image_alpha_set(sheet, EINA_FALSE);
	evas_object_image_data_copy_set(sheet, const_cast<void *>(pixels));
	bool saved = pixels && evas_object_image_save(sheet, out_path, nullptr, "compress=9");
	ecore_evas_free(canvas);
	if (!saved) {
		std::fprintf(stderr, "effect-sheet: cannot write %s\n", out_path);
		return 1;
	}
	std::printf("%s\n", out_path);
	return 0;
}

} // namespace

int main(int argc, char **argv)
{
	if (argc > 3 || (argc > 1 && (!std::strcmp(argv[1], "-h") || !std::strcmp(argv[1], "--help")))) {
		std::fprintf(stderr, "usage: effect-sheet [picture] [out.png]\n");
		return 2;
	}
	const char *picture = argc > 1 ? argv[1] : EFFECT_SHEET_DEFAULT_PICTURE;
	const char *out = argc > 2 ? argv[2] : EFFECT_SHEET_DEFAULT_OUTPUT;
	/* The buffer engine otherwise renders in a worker thread, and a large
	 * sheet can outlast its wait for that thread. */
	setenv("ECORE_EVAS_FORCE_SYNC_RENDER", "1", 0);
	if (!ecore_evas_init()) {
		std::fprintf(stderr, "effect-sheet: EFL did not start\n");
		return 1;
	}
	int result = run(picture, out);
	ecore_evas_shutdown();
	return result;
}
