# shellcheck shell=bash
# Sourced by bash: the host's processes 3, "one", and 4, "two", tell which signals reach them, and
# heard prints the next.
mkfifo heard.$BASHPID
exec 9<>heard.*
for name in one two; do
  perl -MPOSIX -e '$| = 1; for my $n (1 .. 31, 34 .. 64) {
    POSIX::sigaction($n, POSIX::SigAction->new(sub { syswrite STDOUT, "$ARGV[0]:$n\n" }));
  }
  syswrite STDOUT, "ready\n"; sleep 9 while 1' $name >&9 2>/dev/null &
  printf -v "$name" %s $!
done
# shellcheck disable=SC2154  # one and two
export PROCESSES="3=$one 4=$two"
trap 'kill -KILL $one $two' EXIT
heard() { read -r -t 5 -u 9 line && echo "$line"; }
heard >/dev/null; heard >/dev/null
# A signal of our own is the next that they hear.
untouched() { kill -USR1 "$1" && heard; }
