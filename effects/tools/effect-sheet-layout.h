/* The contact sheet's layout, shared by the tool that draws it and the one
 * that compares two sheets tile by tile. */
#ifndef EFFECT_SHEET_LAYOUT_H
#define EFFECT_SHEET_LAYOUT_H

#include "ie-engine.h"

namespace {

constexpr int TILE_WIDTH = 320;
constexpr int COLUMNS = 7;
constexpr int GAP = 14;
constexpr int LABEL_HEIGHT = 30;

struct Tile {
	const char *label;
	int effect; /* -1: the original */
};

/* Catalogue rows 1 to 20, in the order the effect grid shows them. */
constexpr Tile TILES[] = {
	{"Original", -1},
	{"Vintage", IE_EFFECT_VINTAGE},
	{"Sunshine", IE_EFFECT_SUNSHINE},
	{"Nostalgia", IE_EFFECT_NOSTALGIA},
	{"Yellow glow", IE_EFFECT_YELLOW_GLOW},
	{"Blur", IE_EFFECT_BLUR},
	{"Soft glow", IE_EFFECT_SOFT_GLOW},
	{"Old photo", IE_EFFECT_OLD_PHOTO},
	{"Retro", IE_EFFECT_RETRO},
	{"Greyscale", IE_EFFECT_GREYSCALE},
	{"Sepia", IE_EFFECT_SEPIA},
	{"Faded colours", IE_EFFECT_FADED_COLOURS},
	{"Downlight", IE_EFFECT_DOWNLIGHT},
	{"Sharpen", IE_EFFECT_SHARPEN},
	{"Sketch", IE_EFFECT_SKETCH},
	{"Negative", IE_EFFECT_NEGATIVE},
	{"Oil paint", IE_EFFECT_OIL_PAINT},
	{"Posterise", IE_EFFECT_POSTERISE},
	{"Cartoon", IE_EFFECT_CARTOON},
	{"Pop art", IE_EFFECT_POP_ART},
	{"Magic pen", IE_EFFECT_MAGIC_PEN},
};
constexpr int TILE_COUNT = int(sizeof(TILES) / sizeof(TILES[0]));

constexpr int ROWS = (TILE_COUNT + COLUMNS - 1) / COLUMNS;

/* Where tile i's picture starts on the sheet. */
inline void tile_origin(int i, int tile_width, int tile_height, int *x, int *y)
{
	*x = GAP + (i % COLUMNS) * (tile_width + GAP);
	*y = GAP + (i / COLUMNS) * (tile_height + LABEL_HEIGHT + GAP);
}

} // namespace

#endif
