#!/bin/sh
# Prints what has changed in a home's documents since this was last called: a line "there PATH" for
# what was made, written or renamed, "gone IDENTIFIER" for what was deleted. When a folder is renamed,
# what lies in it has another path too, and the line of the folder alone says so. The anchor in FILE says
# since when; the first call makes it, and prints everything. Needs jq.
#
# usage: recent-changes.sh FILE
set -eu

file=${1:?usage: recent-changes.sh FILE}

keep() {
  # Whole or not at all: with half an anchor nothing could be told.
  printf '%s\n' "$1" >"$file.new"
  mv "$file.new" "$file"
}

list_everything() {
  # The anchor comes first, so that what happens during the listing is told by the next call. Each
  # answer is taken whole before it is read: in a pipe its failure would go unnoticed.
  anchor=$(mirabel --json anchor workingset)
  items=$(mirabel --json ls workingset)
  printf '%s\n' "$items" | jq -r '.items[] | "there " + .path'
  keep "$(printf '%s\n' "$anchor" | jq -r .anchor)"
}

if [ ! -e "$file" ]; then
  list_everything
  exit
fi

status=0
changes=$(mirabel --json changes --since "$(cat "$file")" workingset) || status=$?
case $status in
  0) ;;
  4) # The anchor can't be used any more.
    echo "too much has happened; this is everything:" >&2
    list_everything
    exit
    ;;
  *) exit "$status" ;;
esac

printf '%s\n' "$changes" | jq -r '(.updated[] | "there " + .path), (.deleted[] | "gone " + .)'
keep "$(printf '%s\n' "$changes" | jq -rs 'last.anchor')"
