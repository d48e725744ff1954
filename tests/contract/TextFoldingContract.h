#pragma once

#include "platform/TextFolding.h"

#include <gtest/gtest.h>

namespace kelvo::test {

/// What every folding does. `Folding` is an implementation that needs no arguments.
template <typename Folding>
class TextFoldingContract : public testing::Test {
  protected:
    std::string fold(std::string_view text) { return folding.folded(text); }

    Folding folding;
};

TYPED_TEST_SUITE_P(TextFoldingContract);

TYPED_TEST_P(TextFoldingContract, CaseDoesNotMatter) {
    EXPECT_EQ(this->fold("MOVIE_1.MP4"), this->fold("movie_1.mp4"));
    EXPECT_EQ(this->fold("ÉÀÖ"), this->fold("éàö"));
    EXPECT_EQ(this->fold("ÆÐØÞ"), this->fold("æðøþ"));
}

TYPED_TEST_P(TextFoldingContract, DiacriticsDoNotMatter) {
    EXPECT_EQ(this->fold("Écran"), this->fold("ecran"));
    EXPECT_EQ(this->fold("ÀÁÂÃÄÅ ç èéêë ìíîï ñ òóôõö ùúûü ýÿ"),
              this->fold("aaaaaa c eeee iiii n ooooo uuuu yy"));
}

TYPED_TEST_P(TextFoldingContract, DifferentLettersStayDifferent) {
    EXPECT_NE(this->fold("a"), this->fold("b"));
    EXPECT_NE(this->fold("é"), this->fold("a"));
    EXPECT_NE(this->fold("画"), this->fold("面"));
    EXPECT_NE(this->fold("ø"), this->fold("o"));
    EXPECT_NE(this->fold("×"), this->fold("÷"));
    EXPECT_NE(this->fold("a b"), this->fold("ab"));
}

TYPED_TEST_P(TextFoldingContract, FoldedTextFoldsToItself) {
    for (const char* text : {"", "Plain 123_-.", "Écran", "画面録画", "×÷ß"})
        EXPECT_EQ(this->fold(this->fold(text)), this->fold(text)) << text;
}

TYPED_TEST_P(TextFoldingContract, DigitsAndPunctuationStay) {
    EXPECT_EQ(this->fold("0129 _-./:"), "0129 _-./:");
}

TYPED_TEST_P(TextFoldingContract, TextThatIsNotUTF8ComesBackAsItIs) {
    for (const char* text :
         {"A\xFF", "A\xC3", "\xC3\x41", "A\x80", "A\xE2\x82", "\xF8\x88\x80\x80", "A\xC0\xAF"})
        EXPECT_EQ(this->fold(text), text);
}

TYPED_TEST_P(TextFoldingContract, PrefixOfATextFoldsToAPrefix) {
    EXPECT_TRUE(this->fold("Écran_1.mp4").starts_with(this->fold("éCRAN")));
    EXPECT_FALSE(this->fold("Écran_1.mp4").starts_with(this->fold("écrou")));
}

REGISTER_TYPED_TEST_SUITE_P(TextFoldingContract, CaseDoesNotMatter, DiacriticsDoNotMatter,
                            DifferentLettersStayDifferent, FoldedTextFoldsToItself, DigitsAndPunctuationStay,
                            TextThatIsNotUTF8ComesBackAsItIs, PrefixOfATextFoldsToAPrefix);

}  // namespace kelvo::test
