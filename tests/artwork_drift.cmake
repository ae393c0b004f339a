# The committed artwork is what the generator draws today: tessel_artgen redraws both committed
# themes into a temporary folder and every file must match the committed one byte for byte.
if(TARGET tessel_artgen)
  add_test(NAME artwork_drift COMMAND sh -c [[
    set -e; out=$(mktemp -d); trap 'rm -rf "$out"' EXIT
    for theme in light dark; do
      mkdir "$out/$theme"; "$0" "$1/tools/artgen/themes/$theme.theme" "$out/$theme" >/dev/null
      cmp "$out/$theme/image_data.h" "$1/src/render/images/image_data.h"; rm "$out/$theme/image_data.h"
      for f in "$out/$theme"/* "$1/src/render/images/$theme"/*; do cmp "$out/$theme/${f##*/}" "$1/src/render/images/$theme/${f##*/}"; done
    done]] $<TARGET_FILE:tessel_artgen> ${PROJECT_SOURCE_DIR})
  set_tests_properties(artwork_drift PROPERTIES LABELS nosan)
endif()
