# shellcheck shell=bash
# Completion of vornctl for bash. vornctl itself knows what can stand where.

_vornctl() {
  # Words as bash gives them to a command: cut at blanks only (not at ':' and '=', which addresses
  # and URLs hold), and without their quotes.
  local cur words cword
  _get_comp_words_by_ref -n ':=' cur words cword
  local typed=() word candidate
  for word in "${words[@]:1:cword}"; do
    # Quotes and backslashes are the shell's here: no name of ours holds one.
    typed+=("${word//[\\\"\']/}")
  done
  COMPREPLY=()
  while IFS= read -r candidate; do
    case $candidate in
      /files) _filedir ;;
      /folders) _filedir -d ;;
      *)
        if [[ $cur != [\"\']* ]]; then
          printf -v candidate '%q' "$candidate"
          candidate=${candidate//\\,/,}
        fi
        COMPREPLY+=("$candidate")
        ;;
    esac
  done < <("${words[0]}" complete "${typed[@]}" 2>/dev/null)
  # Further words of a list follow without a blank.
  [[ $cur == *,* ]] && compopt -o nospace
  __ltrim_colon_completions "$cur"
}
complete -F _vornctl vornctl
