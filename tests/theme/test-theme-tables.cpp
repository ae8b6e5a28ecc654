/* Colour and font tables and the translation catalogues, read the way the
 * editor reads them. */
#include <Elementary.h>
#include <assist_theme.h>
#include <gtest/gtest.h>
#include <libintl.h>
#include <locale.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "ie-config.h"
#include "ie-test-harness.h"

namespace {

class ThemeTables : public iet::EflTest {};

/* The theme's own defaults agree with the colour table, so the editor
 * looks the same whether or not the table could be read. */
TEST_F(ThemeTables, ColourTableAgreesWithTheThemeDefaults)
{
	Assist_Colour_Table *colors = ea_theme_color_table_new(RES_DIR "image-editor-color.xml");
	ASSERT_NE(nullptr, colors);
	Evas_Object *layout = elm_layout_add(win());
	ASSERT_TRUE(elm_layout_file_set(layout, RES_DIR "edje/image-editor.edj", "iv-editor-view"));
	ASSERT_TRUE(ea_theme_object_colors_set(layout, colors, ASSIST_STYLE_DARK));
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
	ea_theme_color_table_free(colors);

	Assist_Font_Table *fonts = ea_theme_font_table_new(RES_DIR "image-editor-font.xml");
	ASSERT_NE(nullptr, fonts);
	EXPECT_TRUE(ea_theme_object_fonts_set(layout, fonts));
	ea_theme_font_table_free(fonts);
}

/* Every message id in the editor's sources, so a new one without a
 * translation is caught. */
std::set<std::string> message_ids()
{
	std::set<std::string> ids;
	for (const auto &entry : std::filesystem::recursive_directory_iterator(IE_SOURCE_DIR "/editor/src")) {
		std::stringstream text;
		text << std::ifstream(entry.path()).rdbuf();
		const std::string s = text.str();
		for (size_t at = s.find("\"IDS_"); at != std::string::npos; at = s.find("\"IDS_", at + 1)) {
			size_t end = s.find('"', at + 1);
			if (end != std::string::npos)
				ids.insert(s.substr(at + 1, end - at - 1));
		}
	}
	return ids;
}

/* gettext ignores catalogues in the C locale; C.UTF-8 with LANGUAGE picks
 * the language. */
TEST(Translations, EveryMessageIdHasATextInEachLanguage)
{
	const char *saved = getenv("LANGUAGE");
	const std::string saved_language = saved ? saved : "", saved_locale = setlocale(LC_MESSAGES, nullptr);
	setlocale(LC_MESSAGES, "C.UTF-8");
	bindtextdomain("image-editor", RES_DIR "locale");
	bindtextdomain("marlune", RES_DIR "locale");
	const std::set<std::string> ids = message_ids();
	EXPECT_GE(ids.size(), 30u);
	for (const char *language : {"en", "de"}) {
		setenv("LANGUAGE", language, 1);
		/* Catalogues are cached per language: make gettext look again. */
		textdomain(textdomain(nullptr));
		for (const std::string &id : ids)
			EXPECT_STRNE(id.c_str(), dgettext("image-editor", id.c_str())) << language << ": " << id;
		EXPECT_STRNE("IDS_ST_BODY_EDIT", dgettext("marlune", "IDS_ST_BODY_EDIT")) << language;
	}
	EXPECT_STREQ("Verwerfen", dgettext("image-editor", "IDS_IV_SK_DISCARD"));
	if (saved)
		setenv("LANGUAGE", saved_language.c_str(), 1);
	else
		unsetenv("LANGUAGE");
	setlocale(LC_MESSAGES, saved_locale.c_str());
}

} // namespace
