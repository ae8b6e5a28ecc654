/* sheet-psnr before.png after.png: how far two contact sheets of the same
 * picture differ, tile by tile, as the peak signal-to-noise ratio of each
 * tile's colour bytes (labels left out): "same" when the tiles are equal.
 * Exits 1 when a tile falls below 40 dB, which a person can begin to see. */
#include <Ecore.h>
#include <Ecore_Evas.h>
#include <Evas.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <vector>

#include "effect-sheet-layout.h"

namespace {

constexpr double VISIBLE_DB = 40.0;

struct Sheet {
	int width = 0;
	int height = 0;
	std::vector<uint8_t> bgra;
};

bool load(Evas *evas, const char *path, Sheet *sheet)
{
	Evas_Object *image = evas_object_image_add(evas);
	evas_object_image_file_set(image, path, nullptr);
	bool loaded = evas_object_image_load_error_get(image) == EVAS_LOAD_ERROR_NONE;
	if (loaded) {
		evas_object_image_size_get(image, &sheet->width, &sheet->height);
		const auto *data = static_cast<const uint8_t *>(evas_object_image_data_get(image, EINA_FALSE));
		loaded = data && sheet->width > 0 && sheet->height > 0;
		if (loaded)
			sheet->bgra.assign(data, data + size_t(sheet->width) * size_t(sheet->height) * 4);
	}
	evas_object_del(image);
	if (!loaded)
		std::fprintf(stderr, "sheet-psnr: cannot load %s\n", path);
	return loaded;
}

int compare(const Sheet &a, const Sheet &b)
{
	if (a.width != b.width || a.height != b.height) {
		std::fprintf(stderr, "sheet-psnr: the sheets differ in size\n");
		return 2;
	}
	const int tile_width = TILE_WIDTH;
	const int tile_height = (a.height - GAP) / ROWS - LABEL_HEIGHT - GAP;
	if (a.width != GAP + COLUMNS * (tile_width + GAP) || tile_height < 1) {
		std::fprintf(stderr, "sheet-psnr: not a contact sheet of this layout\n");
		return 2;
	}
	int below = 0;
	std::printf("%-14s %10s %10s\n", "tile", "PSNR (dB)", "max diff");
	for (int i = 0; i < TILE_COUNT; ++i) {
		int x0 = 0, y0 = 0;
		tile_origin(i, tile_width, tile_height, &x0, &y0);
		double squares = 0;
		int largest = 0;
		for (int y = y0; y < y0 + tile_height; ++y) {
			for (int x = x0; x < x0 + tile_width; ++x) {
				const size_t at = (size_t(y) * size_t(a.width) + size_t(x)) * 4;
				for (int c = 0; c < 3; ++c) {
					const int d = int(a.bgra[at + size_t(c)]) - int(b.bgra[at + size_t(c)]);
					squares += double(d) * d;
					largest = std::max(largest, std::abs(d));
				}
			}
		}
		const double mse = squares / (double(tile_width) * tile_height * 3);
		if (mse == 0) {
			std::printf("%-14s %10s %10d\n", TILES[i].label, "same", 0);
			continue;
		}
		const double psnr = 10.0 * std::log10(255.0 * 255.0 / mse);
		below += psnr < VISIBLE_DB;
		std::printf("%-14s %10.2f %10d\n", TILES[i].label, psnr, largest);
	}
	return below ? 1 : 0;
}

} // namespace

int main(int argc, char **argv)
{
	if (argc != 3) {
		std::fprintf(stderr, "usage: sheet-psnr before.png after.png\n");
		return 2;
	}
	if (!ecore_evas_init()) {
		std::fprintf(stderr, "sheet-psnr: EFL did not start\n");
		return 2;
	}
	int result = 2;
	if (Ecore_Evas *probe = ecore_evas_buffer_new(16, 16)) {
		Sheet before, after;
		if (load(ecore_evas_get(probe), argv[1], &before) && load(ecore_evas_get(probe), argv[2], &after))
			result = compare(before, after);
		ecore_evas_free(probe);
	}
	ecore_evas_shutdown();
	return result;
}
