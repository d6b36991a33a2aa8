// Uses the installed headers and library: a layout analysis and a Markdown command.
#include <Corvelbase/Corvelbase.h>

#include <iostream>

int main() {
  using namespace corvel;
  auto analyser = RVTextLayoutAnalyser::init();
  analyser->addRecognitionBlock(RVRecognitionBlock::initWithText(
      u"A heading", Rect{0.1, 0.90, 0.8, 0.03}, 99.0, RVRecognitionBlockLevelLine));
  analyser->addRecognitionBlock(RVRecognitionBlock::initWithText(
      u"First line", Rect{0.1, 0.80, 0.4, 0.02}, 97.5, RVRecognitionBlockLevelLine));
  analyser->analyse(Size{1000, 1400}, 0);
  String text = u"Title\n";
  Range replaced;
  String insert = MarkdownCommands::setMarkdownHeaderLevel(text, 2, Range{0, 5}, &replaced);
  text.replace(replaced.location, replaced.length, insert);
  std::cout << toUTF8(analyser->text()) << '|' << toUTF8(text);
  return 0;
}
