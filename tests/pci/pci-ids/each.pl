#!/usr/bin/perl
# Runs lspci with other PCI ID files for each line of the input: what is in the files, " -> ", the
# names of the function and the messages, with "|" for the end of a line and "@" for the folder of
# the files; prints the lines where lspci says otherwise. Each file but the only one begins with
# "[NAME]"; \n, \t, \r and \0 are bytes; DEVICE and CLASS are what a file needs at least; x{70} is a
# letter seventy times.
use strict;
use File::Basename 'dirname';
use File::Path 'make_path', 'remove_tree';
while (chomp(my $line = <STDIN> // exit)) {
  $line =~ s/(.)\{(\d+)\}/$1 x $2/ge;
  my ($text, $expected) = split / -> /, $line, 2;
  $text =~ s/DEVICE/0001  V\\n\\t0002  D\\n/;
  $text =~ s/CLASS/ffff  Illegal\\nC 01  Storage\\n\\t02  Disk\\n/;
  $text =~ s/\\([ntr0])/{n => "\n", t => "\t", r => "\r", 0 => "\0"}->{$1}/ge;
  remove_tree 'hwdata';
  $text =~ s/^(?!\[)/[pci.ids]/;
  while ($text =~ /\[(.*?)\]([^\[]*)/g) {
    make_path dirname "hwdata/$1";
    open my $file, '>', "hwdata/$1" or die;
    print $file $2;
  }
  my ($said) = `lspci -v 2>said` =~ /.{13}(.*)/;
  $said .= `cat said` =~ s,/usr/share/hwdata/,@,gr =~ s/\n/|/gr;
  print "$line\n$said\n" if $said ne $expected;
}
