#include <assist_theme.h>
#include <gtest/gtest.h>

#include <array>
#include <fstream>
#include <string>
#include <vector>

#include "ie-test-harness.h"

namespace {

const std::string color_file = PLATFORM_TEST_DATA "/image-editor-color.xml";
const std::string font_file = PLATFORM_TEST_DATA "/image-editor-font.xml";

using Rgba = std::array<int, 4>;
using Log = std::vector<std::string>;

class EflAssist : public iet::EflTest {};

Rgba class_colour(Evas_Object *edje, const char *color_class, int layer = 0)
{
	Rgba c[3] = {};
	edje_object_color_class_get(edje, color_class, &c[0][0], &c[0][1], &c[0][2], &c[0][3], &c[1][0], &c[1][1],
				    &c[1][2], &c[1][3], &c[2][0], &c[2][1], &c[2][2], &c[2][3]);
	return c[layer];
}

bool code_colour(Evas_Object *obj, const char *code, Rgba *c)
{
	return ea_theme_object_color_get(obj, code, &(*c)[0], &(*c)[1], &(*c)[2], &(*c)[3], nullptr, nullptr,
					 nullptr, nullptr, nullptr, nullptr, nullptr, nullptr);
}

struct Handler {
	Log *log;
	std::string name;
	Evas_Object *parent = nullptr;
};

void record_call(void *data, Evas_Object *, void *)
{
	static_cast<Handler *>(data)->log->push_back(static_cast<Handler *>(data)->name);
}

// A back handler that opens a popup whose own back handler deletes it, the
// way Cancel does in the editor.
void close_self(void *data, Evas_Object *obj, void *)
{
	static_cast<Handler *>(data)->log->push_back("close");
	evas_object_del(obj);
}

void open_popup(void *data, Evas_Object *, void *)
{
	auto *opener = static_cast<Handler *>(data);
	opener->log->push_back(opener->name);
	Evas_Object *popup = elm_popup_add(opener->parent);
	evas_object_show(popup);
	ea_object_event_callback_add(popup, EA_CALLBACK_BACK, close_self, opener);
}

} // namespace

TEST_F(EflAssist, TablesSetClassesItemsAndColoursFoundFromChildren)
{
	Evas_Object *layout = elm_layout_add(win());
	evas_object_show(layout);
	Assist_Colour_Table *table = ea_theme_color_table_new(color_file.c_str());
	EXPECT_TRUE(ea_theme_object_colors_set(layout, table, ASSIST_STYLE_DARK));
	// Objects keep what was applied to them after the table is gone.
	ea_theme_color_table_free(table);
	Evas_Object *edje = elm_layout_edje_get(layout);
	EXPECT_EQ(class_colour(edje, "B0211", 0), (Rgba{18, 18, 18, 230}));
	EXPECT_EQ(class_colour(edje, "B0211", 1), (Rgba{1, 2, 3, 4}));
	EXPECT_EQ(class_colour(edje, "B0211", 2), (Rgba{5, 6, 7, 8}));
	EXPECT_EQ(class_colour(edje, "T0211", 1), (Rgba{0, 0, 0, 0})); // outline not given

	Assist_Font_Table *fonts = ea_theme_font_table_new(font_file.c_str());
	EXPECT_TRUE(ea_theme_object_fonts_set(layout, fonts));
	ea_theme_font_table_free(fonts);
	const char *font = nullptr;
	Evas_Font_Size size = 0;
	ASSERT_TRUE(edje_object_text_class_get(edje, "T0211", &font, &size));
	EXPECT_STREQ(font, "Sans:style=Bold");
	EXPECT_EQ(size, 28);

	Evas_Object *naviframe = elm_naviframe_add(layout);
	Evas_Object *content = elm_scroller_add(naviframe);
	Elm_Object_Item *item = elm_naviframe_item_push(naviframe, nullptr, nullptr, nullptr, content, nullptr);
	Rgba c{};
	ASSERT_TRUE(code_colour(content, "AO004", &c));
	EXPECT_EQ(c, (Rgba{66, 137, 253, 255}));
	EXPECT_TRUE(ea_theme_object_item_color_replace(item, "B0211", "AO004"));
	EXPECT_EQ(class_colour(evas_object_smart_parent_get(content), "B0211"), c);
	EXPECT_TRUE(ea_theme_object_item_color_replace(item, "B0211", "transparent"));
	EXPECT_EQ(class_colour(evas_object_smart_parent_get(content), "B0211"), (Rgba{0, 0, 0, 0}));
	EXPECT_FALSE(ea_theme_object_item_color_replace(item, "B0211", "ZZ999"));
	// Unknown codes, and objects with no table above them, answer no and
	// leave nothing uninitialised behind.
	c = {9, 9, 9, 9};
	EXPECT_FALSE(code_colour(content, "ZZ999", &c));
	EXPECT_EQ(c, (Rgba{0, 0, 0, 0}));
	EXPECT_FALSE(code_colour(win(), "AO004", &c));
}

TEST_F(EflAssist, MissingOrMalformedTablesGiveNull)
{
	EXPECT_EQ(ea_theme_color_table_new("/nonexistent/image-editor-color.xml"), nullptr);
	EXPECT_EQ(ea_theme_font_table_new(color_file.c_str()), nullptr);
	EXPECT_EQ(ea_theme_color_table_new(font_file.c_str()), nullptr);
	const char *bad_tables[] = {
		"",
		"<ColorTable><ColorCode id=\"A\"><Color r=\"1\" g=\"2\" b=\"3\" a=\"4\"/></ColorCode>",
		"<ColorTable><ColorCode id=\"A\"><Color r=\"256\" g=\"2\" b=\"3\" a=\"4\"/></ColorCode></ColorTable>",
		"<ColorTable><ColorCode id=\"A\"><Color r=\"1\" g=\"2\" b=\"3\"/></ColorCode></ColorTable>",
		"<ColorTable><ColorCode id=\"A\"><ShadowColor r=\"1\" g=\"2\" b=\"3\" a=\"4\"/></ColorCode></ColorTable>",
		"<ColorTable><ColorCode id=\"A\"><Color r=\"1\" g=\"2\" b=\"3\" a=\"4\"/></ColorCode>"
		"<ColorCode id=\"A\"><Color r=\"1\" g=\"2\" b=\"3\" a=\"4\"/></ColorCode></ColorTable>",
		"<FontTable><FontCode id=\"T\" font=\"Sans\" size=\"0\"/></FontTable>",
		"<FontTable><FontCode id=\"T\" font=\"Sans\"/></FontTable>",
	};
	std::string path = iet::temp_dir() + "/table.xml";
	for (const char *text : bad_tables) {
		std::ofstream(path) << text;
		EXPECT_EQ(ea_theme_color_table_new(path.c_str()), nullptr) << text;
		EXPECT_EQ(ea_theme_font_table_new(path.c_str()), nullptr) << text;
	}
}

TEST_F(EflAssist, BackKeyGoesToTheNewestLiveShownHandlerOnceAPress)
{
	Log log;
	Handler navi_back{&log, "naviframe"}, popup_back{&log, "popup"}, navi_more{&log, "more"};
	Evas_Object *naviframe = elm_naviframe_add(win());
	evas_object_resize(naviframe, 200, 200);
	evas_object_show(naviframe);
	ea_object_event_callback_add(naviframe, EA_CALLBACK_BACK, record_call, &navi_back);
	ea_object_event_callback_add(naviframe, EA_CALLBACK_MORE, record_call, &navi_more);
	Evas_Object *popup = elm_popup_add(naviframe);
	evas_object_show(popup);
	ea_object_event_callback_add(popup, EA_CALLBACK_BACK, record_call, &popup_back);
	iet::key_press(win(), "Escape");
	iet::key_press(win(), "XF86Back");
	iet::key_press(win(), "Menu");
	EXPECT_EQ(log, (Log{"popup", "popup", "more"}));

	// Deleting the popup ends its registration; hidden objects and other
	// keys get nothing.
	evas_object_del(popup);
	iet::key_press(win(), "Escape");
	evas_object_hide(naviframe);
	iet::key_press(win(), "Escape");
	evas_object_show(naviframe);
	iet::key_press(win(), "Return");
	EXPECT_EQ(log, (Log{"popup", "popup", "more", "naviframe"}));

	EXPECT_EQ(ea_object_event_callback_del(naviframe, EA_CALLBACK_BACK, record_call), &navi_back);
	EXPECT_EQ(ea_object_event_callback_del(naviframe, EA_CALLBACK_BACK, record_call), nullptr);
	iet::key_press(win(), "Escape");
	EXPECT_EQ(log.size(), 4u);

	// One press runs one handler, even when that handler adds another.
	log.clear();
	Handler opener{&log, "open", naviframe};
	ea_object_event_callback_add(naviframe, EA_CALLBACK_BACK, open_popup, &opener);
	for (int i = 0; i < 3; ++i)
		iet::key_press(win(), "Escape");
	EXPECT_EQ(log, (Log{"open", "close", "open"}));
}
