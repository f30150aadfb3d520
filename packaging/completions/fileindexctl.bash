# Completion for fileindexctl in bash. The tool itself knows its commands, options, shares and folders.

_fileindexctl() {
  local tool=${COMP_WORDS[0]/#\~/$HOME} candidate word open='' before=''
  local -a words=() candidates=()

  # bash cuts "--kinds=audio" at the sign; the tool wants the option and its value as two words.
  for word in "${COMP_WORDS[@]:1:COMP_CWORD}"; do
    word=${word//\\/}
    word=${word#[\"\']}
    [[ "$word" == = ]] || words+=("$word")
  done
  [[ "${COMP_WORDS[COMP_CWORD]}" != = ]] || words+=('')
  word=${words[-1]}

  COMPREPLY=()
  mapfile -t candidates < <("$tool" complete-words "${words[@]}" 2>/dev/null)
  for candidate in "${candidates[@]}"; do
    case "$candidate" in
    :open) open=yes ;;
    :files | :folders)
      compopt -o filenames 2>/dev/null
      mapfile -t -O "${#COMPREPLY[@]}" COMPREPLY < <(compgen "$([[ "$candidate" == :files ]] && echo -f || echo -d)" -- "$word")
      ;;
    :users) mapfile -t -O "${#COMPREPLY[@]}" COMPREPLY < <(compgen -u -- "$word") ;;
    *)
      # ":" cuts a word, too: only what stands behind the last one is replaced.
      [[ "$word" != *:* || "$COMP_WORDBREAKS" != *:* ]] || before=${word%"${word##*:}"}
      printf -v candidate '%q' "${candidate#"$before"}"
      COMPREPLY+=("$candidate")
      ;;
    esac
  done
  [[ -z "$open" ]] || compopt -o nospace 2>/dev/null
}

complete -F _fileindexctl fileindexctl
