# The styles program on Word files, recognised by their content. Included from
# tests/CMakeLists.txt after the command tests, whose helper it uses.
set(WORD_CORPUS ${PROJECT_SOURCE_DIR}/../shared/corpus/word)
set(WORD_TEMPLATE ${WORD_CORPUS}/word-default-template.docx)

styles_command_test(WordShowExplain 0 show ${WORD_TEMPLATE} "Heading 1" --explain
  OUTPUT "heading 1 \\(Paragraph\\), inherits Normal\n.*lineSpacing +1.15 +from Paragraph Defaults\n.*character.fontAscii +Calibri +own\n.*character.fontSize +14 +own\n.*character.language +en-US +from Paragraph Defaults › character")
styles_command_test(WordListStandardInput 0 list - INPUT ${WORD_CORPUS}/tbl-having-applied-style.docx
  OUTPUT "Table Defaults\n    Normal Table\n      Light Shading Accent 1\n")
styles_command_test(WordValidate 1 validate ${WORD_CORPUS}/sty-having-no-styles-part.docx
  ${CMAKE_CURRENT_SOURCE_DIR}/data/word/based-on-self.xml
  OUTPUT "no styles part.*\\[word-error\\].*w:style \"A\": is based on itself.*\\[word-warning\\]")
styles_command_test(WordFlatten 0 flatten ${WORD_TEMPLATE} "Light Shading"
  OUTPUT "\"firstRow\": {.*\"bold\": \"1\"")
styles_command_test(WordConvertPart 0 convert ${CMAKE_CURRENT_SOURCE_DIR}/data/word/duplicate-ids.xml
  OUTPUT "\"First\": {.*\"Second\": {" ERROR "repeats a style ID")

# Edits through JSON, then styles diff and the independent reader (python-docx)
# check the package written. Debian's python3 holds python3-docx.
find_program(STYLES_SYSTEM_PYTHON python3 PATHS /usr/bin NO_DEFAULT_PATH)
if(NOT STYLES_SYSTEM_PYTHON)
  find_program(STYLES_SYSTEM_PYTHON python3)
endif()
if(STYLES_SYSTEM_PYTHON)
  add_test(NAME StylesCommand.WordPackageEdit
    COMMAND ${STYLES_SYSTEM_PYTHON} ${CMAKE_CURRENT_SOURCE_DIR}/Word/word_package_check.py
      $<TARGET_FILE:styles> ${WORD_TEMPLATE} ${CMAKE_CURRENT_BINARY_DIR}/WordPackageEdit)
  set_tests_properties(StylesCommand.WordPackageEdit PROPERTIES SKIP_RETURN_CODE 77)
endif()
