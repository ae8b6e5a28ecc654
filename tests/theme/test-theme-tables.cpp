/* Colour and font tables and the translation catalogues, read the way the
 * editor reads them. */
#include <Elementary.h>
#include <efl_assist.h>
#include <gtest/gtest.h>
#include <libintl.h>
#include <locale.h>

#include <algorithm>
#include <cstdlib>
#include <string>
#include <vector>

#include "ie-config.h"
#include "ie-test-harness.h"

namespace {

/* Every message id the editor shows. */
const char *const kMessageIds[] = {
	"IDS_ST_BODY_EDIT",
	"IDS_IV_BODY_CROP",
	"IDS_TPLATFORM_ACBUTTON_CANCEL_ABB",
	"IDS_TPLATFORM_ACBUTTON_DONE_ABB",
	"IDS_CLD_HEADER_DISCARD_CHANGES_ABB",
	"IDS_CLD_POP_ALL_CHANGES_WILL_BE_DISCARDED",
	"IDS_IV_BUTTON_CANCEL",
	"IDS_IV_SK_DISCARD",
	"IDS_MF_POP_NOT_ENOUGH_MEMORY_DELETE_SOME_ITEMS",
	"IDS_MEDIABR_BUTTON_OK",
	"IDS_360V_TPOP_LOADING_ING",
	"IDS_IV_OPT_VINTAGE_M_EFFECT",
	"IDS_IV_OPT_SUNSHINE_M_EFFECT",
	"IDS_IV_OPT_NOSTALGIA_M_EFFECT",
	"IDS_IV_OPT_YELLOW_GLOW_M_EFFECT",
	"IDS_IV_OPT_BLUR_M_EFFECT",
	"IDS_IV_OPT_SOFT_GLOW_M_EFFECT",
	"IDS_IV_OPT_OLD_PHOTO_M_EFFECT",
	"IDS_IV_OPT_RETRO_M_EFFECT",
	"IDS_IV_OPT_GREYSCALE_M_EFFECT",
	"IDS_IV_OPT_SEPIA_M_EFFECT",
	"IDS_IV_OPT_FADED_COLOURS_M_EFFECT",
	"IDS_IV_OPT_DOWNLIGHT_M_EFFECT",
	"IDS_IV_OPT_SHARPEN_M_EFFECT",
	"IDS_IV_OPT_SKETCH_M_EFFECT",
	"IDS_IMGE_OPT_EFFECTS_NEGATIVE",
	"IDS_IV_OPT_OIL_PAINT_M_EFFECT",
	"IDS_IV_OPT_POSTERISE_M_EFFECT",
	"IDS_IV_OPT_CARTOON_M_EFFECT",
	"IDS_IV_OPT_POP_ART_M_EFFECT",
	"IDS_IV_OPT_MAGIC_PEN_M_EFFECT",
};

class ThemeTables : public iet::EflTest {};

TEST_F(ThemeTables, ColourTableRecoloursTheThemeThroughItsCodes)
{
	Ea_Theme_Color_Table *colors = ea_theme_color_table_new(RES_DIR "image-editor-color.xml");
	ASSERT_NE(nullptr, colors);
	Evas_Object *layout = elm_layout_add(win());
	ASSERT_TRUE(elm_layout_file_set(layout, RES_DIR "edje/image-editor.edj", "iv-editor-view"));
	ASSERT_TRUE(ea_theme_object_colors_set(layout, colors, EA_THEME_STYLE_DARK));

	int r = -1, g = -1, b = -1, a = -1;
	ASSERT_TRUE(ea_theme_object_color_get(layout, "AO004", &r, &g, &b, &a, nullptr, nullptr, nullptr, nullptr,
					      nullptr, nullptr, nullptr, nullptr));
	/* The crop box is drawn in it over any picture: bright and opaque. */
	EXPECT_EQ(255, a);
	EXPECT_GE(std::max({r, g, b}), 200);
	EXPECT_TRUE(ea_theme_object_color_get(layout, "B0211", &r, &g, &b, &a, nullptr, nullptr, nullptr, nullptr,
					      nullptr, nullptr, nullptr, nullptr));

	/* The theme's own defaults agree with the table, so the editor looks
	 * the same whether or not the table could be read. */
	Evas_Object *plain = edje_object_add(evas());
	ASSERT_TRUE(edje_object_file_set(plain, RES_DIR "edje/image-editor.edj", "iv-editor-view"));
	for (const char *code : {"AO004", "B011", "B012", "B0211"}) {
		int tr, tg, tb, ta, dr, dg, db, da;
		ASSERT_TRUE(ea_theme_object_color_get(layout, code, &tr, &tg, &tb, &ta, nullptr, nullptr, nullptr,
						      nullptr, nullptr, nullptr, nullptr, nullptr))
			<< code;
		ASSERT_TRUE(edje_object_color_class_get(plain, code, &dr, &dg, &db, &da, nullptr, nullptr, nullptr,
							nullptr, nullptr, nullptr, nullptr, nullptr))
			<< code;
		EXPECT_EQ((std::vector<int>{tr, tg, tb, ta}), (std::vector<int>{dr, dg, db, da})) << code;
	}
	evas_object_del(plain);
	evas_object_del(layout);
	ea_theme_color_table_free(colors);
}

TEST_F(ThemeTables, FontTableParses)
{
	Ea_Theme_Font_Table *fonts = ea_theme_font_table_new(RES_DIR "image-editor-font.xml");
	ASSERT_NE(nullptr, fonts);
	Evas_Object *layout = elm_layout_add(win());
	ASSERT_TRUE(elm_layout_file_set(layout, RES_DIR "edje/image-editor.edj", "iv-funcbar"));
	EXPECT_TRUE(ea_theme_object_fonts_set(layout, fonts));
	evas_object_del(layout);
	ea_theme_font_table_free(fonts);
}

/* gettext ignores catalogues in the C locale; C.UTF-8 with LANGUAGE picks
 * the language. */
class Translations : public ::testing::Test {
protected:
	void SetUp() override
	{
		const char *language = getenv("LANGUAGE");
		saved_language = language ? language : "";
		had_language = language != nullptr;
		const char *locale = setlocale(LC_MESSAGES, nullptr);
		saved_locale = locale ? locale : "C";
		setlocale(LC_MESSAGES, "C.UTF-8");
		bindtextdomain("image-editor", RES_DIR "locale");
		bindtextdomain("marlune", RES_DIR "locale");
	}
	void TearDown() override
	{
		if (had_language)
			setenv("LANGUAGE", saved_language.c_str(), 1);
		else
			unsetenv("LANGUAGE");
		setlocale(LC_MESSAGES, saved_locale.c_str());
	}
	void use_language(const char *language)
	{
		setenv("LANGUAGE", language, 1);
		/* Catalogues are cached per language: make gettext look again. */
		textdomain(textdomain(nullptr));
	}
	std::string saved_language, saved_locale;
	bool had_language = false;
};

TEST_F(Translations, EveryMessageIdHasATextInEachLanguage)
{
	for (const char *language : {"en", "de"}) {
		use_language(language);
		for (const char *id : kMessageIds) {
			const char *text = dgettext("image-editor", id);
			EXPECT_STRNE(id, text) << language << ": " << id;
		}
		EXPECT_STRNE("IDS_ST_BODY_EDIT", dgettext("marlune", "IDS_ST_BODY_EDIT")) << language;
	}
	use_language("en");
	EXPECT_STREQ("Edit", dgettext("image-editor", "IDS_ST_BODY_EDIT"));
	use_language("de");
	EXPECT_STREQ("Verwerfen", dgettext("image-editor", "IDS_IV_SK_DISCARD"));
}

} // namespace
