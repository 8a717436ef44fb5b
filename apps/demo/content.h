// What lies in each share of the demo appliance.
#ifndef ORVEL_DEMO_CONTENT_H
#define ORVEL_DEMO_CONTENT_H

#include "tree.h"

namespace orvel::demo {

void fillPhoto(Tree& tree);      // pages of files of every size and time, folders by year, a recycle bin
void fillMusic(Tree& tree);      // albums
void fillProjects(Tree& tree);   // folders of several owners and modes, links, a recycle bin
void fillWorldwide(Tree& tree);  // names that programs stumble over
void fillWarehouse(Tree& tree);  // one flat folder of 20,000 files
void fillHomes(Tree& tree);      // nothing: homes are made on first use
void fillSample(Tree& tree);     // a few files

}  // namespace orvel::demo

#endif
