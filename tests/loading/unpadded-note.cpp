// A library that has nothing but a note, as a compiler of another language writes it: the last, and what it
// says ends where the notes end.
asm(".pushsection .note.zz, \"a\", %note\n"
    "  .balign 4\n"
    "  .long 4, 1, 77\n"
    "  .asciz \"abc\"\n"
    "  .byte 1\n"
    ".popsection\n");
