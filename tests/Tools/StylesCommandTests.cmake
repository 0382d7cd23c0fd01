# The styles program through CTest: each case runs it on small files and
# checks its exit status and output. Included from tests/CMakeLists.txt.
set(STYLES_CLI_FILES ${CMAKE_CURRENT_SOURCE_DIR}/Tools/cli)
set(STYLES_SAMPLE ${PROJECT_SOURCE_DIR}/examples/sample-sheet.json)

# styles_command_test(NAME STATUS ARGS... [OUTPUT re] [ERROR re] [SAME_AS file]
#                     [INPUT file] [OUTPUT_TO file] [RUN_IN dir] [WORK_DIR dir]
#                     [COPY file] [RESULT file RESULT_SAME_AS file])
# (see RunStyles.cmake).
set(STYLES_CHECKS OUTPUT ERROR SAME_AS INPUT OUTPUT_TO RUN_IN WORK_DIR COPY RESULT RESULT_SAME_AS)
function(styles_command_test name status)
  cmake_parse_arguments(PARSE_ARGV 2 check "" "${STYLES_CHECKS}" "")
  string(JOIN "|" arguments ${check_UNPARSED_ARGUMENTS})
  set(definitions -DPROGRAM=$<TARGET_FILE:styles> "-DARGS=${arguments}" -DSTATUS=${status})
  foreach(option ${STYLES_CHECKS})
    if(DEFINED check_${option})
      list(APPEND definitions "-D${option}=${check_${option}}")
    endif()
  endforeach()
  add_test(NAME StylesCommand.${name}
    COMMAND ${CMAKE_COMMAND} ${definitions} -P ${CMAKE_CURRENT_SOURCE_DIR}/Tools/RunStyles.cmake)
endfunction()

styles_command_test(Help 0 --help OUTPUT "validate.*list.*show.*flatten.*diff.*format.*preset")
styles_command_test(MissingArgument 2 show ${STYLES_SAMPLE})

styles_command_test(ValidateClean 0 validate ${STYLES_SAMPLE} OUTPUT "no problems")
styles_command_test(ValidateErrors 1 validate ${STYLES_SAMPLE} ${STYLES_CLI_FILES}/broken.json
  OUTPUT "broken.json:1:25: error: /paragraph/Body/spaceAfter: .*\\[bad-value\\].*\\[missing-parent\\]")
# Bytes that are not UTF-8, a repeated member, a shortened number (each with
# line and column) and a document of which nothing is read.
styles_command_test(ValidateProblems 1 validate problems.json unread.json surrogate.json
  RUN_IN ${STYLES_CLI_FILES} SAME_AS ${STYLES_CLI_FILES}/validate-problems.txt)
styles_command_test(ValidateJson 1 validate --json ${STYLES_CLI_FILES}/broken.json
  OUTPUT "\"valid\": false.*\"code\": \"bad-value\".*\"pointer\": \"/paragraph/Body/spaceAfter\"")
styles_command_test(ValidateNotJson 1 validate ${STYLES_CLI_FILES}/notjson.json
  OUTPUT "notjson.json:2:3: error: .*\\[invalid-json\\]")
styles_command_test(ValidateStandardInput 0 validate - INPUT ${STYLES_SAMPLE} OUTPUT "<stdin>: no problems")
styles_command_test(ValidateCycle 1 validate ${STYLES_CLI_FILES}/cycle.json
  OUTPUT "/paragraph/A/inherits.*/paragraph/B/inherits.*/paragraph/C/inherits")

styles_command_test(ShowExplain 0 show ${STYLES_SAMPLE} "Heading 1" --explain
  SAME_AS ${STYLES_CLI_FILES}/show-heading-1.txt)
styles_command_test(ShowJson 0 show --json ${STYLES_SAMPLE} "quote" OUTPUT
  "\"path\": \"character.italic\",[^}]*\"value\": \"1\",[^}]*\"source\": \"ancestor\",[^}]*\"from\": {[^}]*\"style\": \"Emphasis\",[^}]*\"path\": \"\"")
styles_command_test(ShowJsonOwner 0 --json show ${STYLES_SAMPLE} "Heading 1" OUTPUT
  "\"source\": \"owner\",[^}]*\"from\": {[^}]*\"style\": \"Heading\",[^}]*\"path\": \"character\"[^}]*},[^}]*\"through\": {[^}]*\"style\": \"Heading 1\"")
styles_command_test(ShowAstral 0 show ${STYLES_CLI_FILES}/astral.json "𝐀 child" --explain
  OUTPUT "spaceAfter +2 +from 𝐀 Astral")
styles_command_test(ShowMissingStyle 1 show ${STYLES_SAMPLE} "No Such Style" ERROR "no style is called")
styles_command_test(ShowUnusable 4 show ${STYLES_CLI_FILES}/cycle.json A ERROR "inheritance-cycle")
styles_command_test(ShowNotJson 4 show ${STYLES_CLI_FILES}/notjson.json A ERROR "invalid-json")

styles_command_test(List 0 list ${STYLES_SAMPLE}
  OUTPUT "paragraph \\(Paragraph\\), 20 styles\n  Normal\n    Body Text\n      Body Text First Indent")
styles_command_test(ListJson 0 list --json ${STYLES_SAMPLE}
  OUTPUT "\"name\": \"Chapter Title\",[^}]*\"inherits\": \"Heading 1\",[^}]*\"depth\": 3")
styles_command_test(Flatten 0 flatten ${STYLES_SAMPLE} "Chapter Title" OUTPUT "\"keepWithNext\": \"1\"")
styles_command_test(FlattenSubstyle 0 flatten ${STYLES_SAMPLE} "Chapter Title"
  OUTPUT "\"character\": {[^}]*\"fontName\": \"Avenir Next\"")
styles_command_test(DiffSame 0 diff ${STYLES_SAMPLE} ${STYLES_SAMPLE})
styles_command_test(DiffChanged 1 diff --effective ${STYLES_CLI_FILES}/old.json ${STYLES_CLI_FILES}/new.json
  OUTPUT "paragraph \"Added\": added\nparagraph \"Base\": spaceAfter: 1 -> 2\nparagraph \"body\": spaceAfter \\(effective\\): 1 -> 2\nparagraph \"Gone\": removed\n")
styles_command_test(Format 0 format --compact ${STYLES_CLI_FILES}/old.json
  SAME_AS ${STYLES_CLI_FILES}/old-formatted.json)

# Rewriting keeps every value, temporary ones at any depth, and loses nothing
# silently.
set(notes --schema ${STYLES_CLI_FILES}/note-schema.json)
styles_command_test(FormatKeepsTemporaries 0 format ${notes} --compact
  ${STYLES_CLI_FILES}/temporaries.json SAME_AS ${STYLES_CLI_FILES}/temporaries.json)
styles_command_test(FlattenKeepsTemporaries 0 ${notes} flatten ${STYLES_CLI_FILES}/temporaries.json B
  OUTPUT "\"parts\": \\[\n +{\n +\"draft\": \"1\"\n +},\n +{\n +\"child\": {\n +\"draft\": \"1\"")
styles_command_test(FormatLossy 0 format --lossy --compact ${STYLES_CLI_FILES}/lossy.json
  SAME_AS ${STYLES_CLI_FILES}/lossy-formatted.json
  ERROR "lossy.json:1:39: warning: .*number-rounded.*unknown-property")
styles_command_test(FormatToFile 0 format --compact ${STYLES_CLI_FILES}/old.json
  -o ${CMAKE_CURRENT_BINARY_DIR}/Formatted/old.json WORK_DIR ${CMAKE_CURRENT_BINARY_DIR}/Formatted
  OUTPUT "^$" RESULT ${CMAKE_CURRENT_BINARY_DIR}/Formatted/old.json
  RESULT_SAME_AS ${STYLES_CLI_FILES}/old-formatted.json)
styles_command_test(FormatInPlace 0 format --compact --in-place old.json
  WORK_DIR ${CMAKE_CURRENT_BINARY_DIR}/InPlace COPY ${STYLES_CLI_FILES}/old.json
  RUN_IN ${CMAKE_CURRENT_BINARY_DIR}/InPlace RESULT ${CMAKE_CURRENT_BINARY_DIR}/InPlace/old.json
  RESULT_SAME_AS ${STYLES_CLI_FILES}/old-formatted.json)

styles_command_test(Version 0 --version OUTPUT "^styles [0-9]+\\.[0-9]+\\.[0-9]+\n$")
styles_command_test(CommonOptionsFirst 0 --json ${notes} list ${STYLES_CLI_FILES}/notes.json
  OUTPUT "\"name\": \"Todo\"")

# Exit statuses: one row for each way a command fails. With --json the error
# is the only output, as an object.
styles_command_test(UnknownCommand 2 valdate x
  ERROR "unknown command \"valdate\" \\(did you mean \"validate\"\\?\\)")
styles_command_test(UnknownPresetCommand 2 --json preset lst --folder .
  OUTPUT "^{\n  \"error\": {\n    \"status\": 2,[^}]*did you mean [^}]*list")
styles_command_test(StandardInputTwice 2 diff - - ERROR "standard input \\(-\\) can be read only once")
styles_command_test(StandardInputAsSchema 2 validate --schema - - ERROR "only once")
styles_command_test(InPlaceStandardInput 2 format --in-place - ERROR "needs a file")
styles_command_test(FormatIntoItself 2 format old.json WORK_DIR ${CMAKE_CURRENT_BINARY_DIR}/Into
  COPY ${STYLES_CLI_FILES}/old.json RUN_IN ${CMAKE_CURRENT_BINARY_DIR}/Into
  OUTPUT_TO ${CMAKE_CURRENT_BINARY_DIR}/Into/old.json ERROR "old.json: is also standard output")
styles_command_test(InPlaceAndOutput 2 format --in-place -o x.json ${STYLES_SAMPLE} ERROR "excludes")
styles_command_test(ValidateUnreadable 3 validate ${STYLES_CLI_FILES}/absent.json
  ERROR "absent.json: cannot be read: No such file or directory")
styles_command_test(ReadFolder 3 list ${STYLES_CLI_FILES} ERROR "cannot be read: Is a directory")
styles_command_test(SchemaUnreadable 3 list --schema ${STYLES_CLI_FILES}/absent.json
  ${STYLES_SAMPLE} ERROR "absent.json: cannot be read: No such file")
styles_command_test(JsonUnreadable 3 --json list ${STYLES_CLI_FILES}/absent.json
  OUTPUT "\"status\": 3,[^}]*absent.json\",[^}]*\"message\": \"cannot be read: No such file")
styles_command_test(FormatFullDisk 3 format ${STYLES_SAMPLE} OUTPUT_TO /dev/full
  ERROR "cannot write standard output: No space left on device")
styles_command_test(FlattenFullDisk 3 flatten ${STYLES_SAMPLE} "Chapter Title" OUTPUT_TO /dev/full
  ERROR "No space left on device")
styles_command_test(FormatUnwritable 3 format ${STYLES_SAMPLE} -o ${STYLES_CLI_FILES}/absent/x.json
  ERROR "x.json: cannot be written: .+")
styles_command_test(FormatRefusesLoss 4 format ${STYLES_CLI_FILES}/lossy.json
  ERROR "number-rounded.*unknown-property.*--lossy accepts")
styles_command_test(FlattenRefusesLoss 4 flatten ${STYLES_CLI_FILES}/lossy.json Body ERROR "--lossy")
styles_command_test(ListInvalidUtf8 4 list ${STYLES_CLI_FILES}/problems.json
  ERROR "problems.json:3:6: error: byte 0xFF")
styles_command_test(JsonUnusable 4 show --json ${STYLES_CLI_FILES}/cycle.json A
  OUTPUT "\"status\": 4,.*\"code\": \"inheritance-cycle\",.*\"line\": [0-9]+")
styles_command_test(JsonNegative 1 show --json ${STYLES_SAMPLE} "No Such Style"
  OUTPUT "^{\n  \"error\": {\n    \"status\": 1,[^}]*no style is called")

styles_command_test(CustomSchema 0 show --schema ${STYLES_CLI_FILES}/note-schema.json
  ${STYLES_CLI_FILES}/notes.json later --explain OUTPUT "text +- +default\n  priority +low +own")
styles_command_test(MalformedSchema 2 validate --schema ${STYLES_CLI_FILES}/bad-schema.json
  ${STYLES_SAMPLE} ERROR "bad-schema.json: not a schema: /categories/0/properties/0/type")
styles_command_test(SchemaContradictsDocument 1 validate --schema ${STYLES_CLI_FILES}/note-schema.json
  ${STYLES_SAMPLE} OUTPUT "/cell: category \"cell\" is not registered.*\\[nothing-read\\]")
styles_command_test(SchemaLacksTheStyle 1 show --schema ${STYLES_CLI_FILES}/note-schema.json
  ${STYLES_SAMPLE} "Heading 1" ERROR "no style is called")

# Presets: each step works on the folder the steps before it left.
set(presets ${CMAKE_CURRENT_BINARY_DIR}/Presets)
styles_command_test(PresetAdd 0 preset add --folder ${presets} Headings ${STYLES_SAMPLE}
  "Heading 2" --name "Big Heading" WORK_DIR ${presets} OUTPUT "added preset")
styles_command_test(PresetAddAgain 1 preset add --folder ${presets} Headings ${STYLES_SAMPLE}
  "Heading 1" --name "big heading" ERROR "--replace")
styles_command_test(PresetList 0 preset list --folder ${presets} Headings OUTPUT "^Big Heading\n$")
styles_command_test(PresetShow 0 preset show --folder ${presets} Headings "big heading"
  OUTPUT "spaceBefore +18 +own.*character.fontSize +16 +own")
styles_command_test(PresetDelete 0 preset delete --folder ${presets} Headings "Big Heading")
styles_command_test(PresetDeleteMissing 1 preset delete --folder ${presets} Headings "Big Heading")
styles_command_test(PresetNoFolder 3 preset list --folder ${presets}/absent
  ERROR "absent: is not a folder: No such file or directory")
string(REPEAT x 300 longName)
styles_command_test(PresetLongSetName 3 preset add --folder ${CMAKE_CURRENT_BINARY_DIR} ${longName} ${STYLES_SAMPLE} Emphasis
  ERROR "cannot create the preset set \"x+\": File name too long")
add_test(NAME StylesCommand.PresetFiles
  COMMAND ${CMAKE_COMMAND} -DPROGRAM=$<TARGET_FILE:styles> -DSAMPLE=${STYLES_SAMPLE}
    -DWORK_DIR=${CMAKE_CURRENT_BINARY_DIR}/PresetFiles -P ${CMAKE_CURRENT_SOURCE_DIR}/Tools/PresetFiles.cmake)
set_tests_properties(StylesCommand.PresetFiles PROPERTIES SKIP_REGULAR_EXPRESSION "SKIPPED:")
set_tests_properties(StylesCommand.PresetAddAgain PROPERTIES DEPENDS StylesCommand.PresetAdd)
set_tests_properties(StylesCommand.PresetList PROPERTIES DEPENDS StylesCommand.PresetAddAgain)
set_tests_properties(StylesCommand.PresetShow PROPERTIES DEPENDS StylesCommand.PresetList)
set_tests_properties(StylesCommand.PresetDelete PROPERTIES DEPENDS StylesCommand.PresetShow)
set_tests_properties(StylesCommand.PresetDeleteMissing PROPERTIES DEPENDS StylesCommand.PresetDelete)
set_tests_properties(StylesCommand.PresetAdd StylesCommand.PresetAddAgain StylesCommand.PresetList
  StylesCommand.PresetShow StylesCommand.PresetDelete StylesCommand.PresetDeleteMissing
  PROPERTIES RESOURCE_LOCK StylesPresetFolder)
