// A library that contains only an ELF note, as a compiler of another language writes it. The note is the last
// one. Its content is not padded and ends where the section ends.
asm(".pushsection .note.zz, \"a\", %note\n"
    "  .balign 4\n"
    "  .long 4, 1, 77\n"
    "  .asciz \"abc\"\n"
    "  .byte 1\n"
    ".popsection\n");
