# bash completion for vesk-unpack

_vesk_unpack() {
  local word=${COMP_WORDS[COMP_CWORD]} option=${COMP_WORDS[COMP_CWORD - 1]} i
  local types='payload command-response web-tunnel-response'
  COMPREPLY=()
  for ((i = 1; i < COMP_CWORD; ++i)); do
    [[ ${COMP_WORDS[i]} != -- ]] || option=files
  done
  # Bash makes '=' a word of its own: --type = pay
  if [[ $word == = ]]; then
    word=
  elif [[ $option == = ]]; then
    option=${COMP_WORDS[COMP_CWORD - 2]}
  fi
  case $option in
    --type) mapfile -t COMPREPLY < <(compgen -W "$types auto" -- "$word") ;;
    --schema) mapfile -t COMPREPLY < <(compgen -W "$types" -- "$word") ;;
    --format) mapfile -t COMPREPLY < <(compgen -W 'text json' -- "$word") ;;
    *)
      if [[ $word == -* && $option != files ]]; then
        mapfile -t COMPREPLY < <(compgen -W '--type --format --exact-integers --strict --recursive --files-from
          --summary --quiet --schema --service --self-test --help --version' -- "$word")
      else
        compopt -o filenames 2>/dev/null
        mapfile -t COMPREPLY < <(compgen -f -- "$word")
      fi
      ;;
  esac
}

complete -F _vesk_unpack vesk-unpack
