#pragma once

class QWidget;

// Moves a window whose stored place lies on no screen at all back to (40, 40). A window
// that overlaps any screen, even partly, stays where it is.
void EnsureWindowPlacementOnDesktop(QWidget* widget);
