#include "dataset/first_word.h"

#include <fstream>
#include <locale>

void
read_first_word(const std::string& path, std::string& target)
{
    std::ifstream in(path, std::ios::in);
    // The classic locale fixes what counts as white space; bytes of 0x80
    // and above are never white space there and stay part of the word.
    in.imbue(std::locale::classic());
    std::string word;
    if (in >> word)
        target = word;
}
