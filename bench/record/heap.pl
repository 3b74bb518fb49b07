#!/usr/bin/perl
# Builds and drops a list of small hashes, ROUNDS times: 20 million heap calls a second.
use strict;
use warnings;

my $rounds = shift // 400;
my $sum = 0;
for my $round (1 .. $rounds) {
    my @list;
    push @list, {key => "k$_", value => [$_, $round]} for 1 .. 5000;
    $sum += @list;
}
print "$sum\n";
