#!/usr/bin/env python3
"""Where things of a plot stand, and that the whole is a drawing."""

import unittest
import xml.etree.ElementTree

import svg

NAMESPACE = "{http://www.w3.org/2000/svg}"


class AxisTest(unittest.TestCase):
    def test_ticks_enclose_the_values(self):
        for low, high, labels in (
                (0, 7.4, ["0", "2", "4", "6", "8"]),
                (0.63, 1.27, ["0.6", "0.8", "1", "1.2", "1.4"]),
                (0, 48, ["0", "10", "20", "30", "40", "50"]),
                (-3, 3, ["-3", "-2", "-1", "0", "1", "2", "3"]),
                (1, 1, ["1", "1.2"])):
            with self.subTest(low=low, high=high):
                axis = svg.Axis.linear("", low, high)
                self.assertEqual([label for _, label in axis.ticks], labels)
                self.assertTrue(axis.low <= low + 1e-9 and high <= axis.high + 1e-9)

    def test_logarithmic(self):
        axis = svg.Axis.logarithm("", 9, 410)
        self.assertEqual([label for _, label in axis.ticks],
                         ["10", "20", "50", "100", "200"])
        self.assertAlmostEqual(axis.at(40) - axis.at(20), axis.at(400) - axis.at(200))
        narrow = svg.Axis.logarithm("", 0.9, 1.6)
        self.assertEqual([label for _, label in narrow.ticks], ["1", "1.2", "1.5"])

    def test_places(self):
        axis = svg.Axis.linear("", 0, 10)
        self.assertEqual([axis.at(value) for value in (0, 5, 10)], [0, 0.5, 1])
        self.assertEqual([axis.reversed().at(value) for value in (0, 5, 10)], [1, 0.5, 0])
        panel = svg.Panel((50, 20, 250, 120), axis, axis)
        self.assertEqual((panel.x(0), panel.x(10), panel.y(0), panel.y(10)), (50, 250, 120, 20))


class DrawingTest(unittest.TestCase):
    def test_a_whole_drawing(self):
        axis = svg.Axis.linear("values & <units>", 0, 10)
        panel = svg.Panel((60, 40, 400, 260), axis, axis.reversed(), "title")
        panel.curve([(0, 1), (5, 5)], 3)
        for series in range(svg.SERIES):
            panel.mark(series, series, series, f"<{series}>")
        panel.upper_right(5, 5, "note")
        written = svg.drawing(500, 320, "a & b", [panel], svg.legend(420, 60, [("one", 1)]))
        root = xml.etree.ElementTree.fromstring(written)
        self.assertEqual(root.get("viewBox"), "0 0 500 320")
        marks = [tag for tag in root.iter() if tag.get("fill") == "currentColor"]
        self.assertEqual(len(marks), svg.SERIES + 1)
        self.assertEqual(marks[2].find(f"{NAMESPACE}title").text, "<2>")
        self.assertTrue(written.isascii())
        # Every class has its rule; every series has a colour on light and one on dark paper.
        style = root.find(f"{NAMESPACE}style").text
        for kind in {name for tag in root.iter() for name in (tag.get("class") or "").split()}:
            self.assertIn(f".{kind} ", style)
        for series in range(svg.SERIES):
            self.assertEqual(style.count(f".s{series} "), 2)

    def test_labels_keep_clear_of_each_other(self):
        axis = svg.Axis.linear("", 0, 10)
        panel = svg.Panel((60, 40, 400, 260), axis, axis)
        before = len(panel.lines)
        panel.labels_beside([(8, 9, "a long label", 0), (8.2, 9, "another one", 1),
                             (8, 8.5, "the third", 2)])
        boxes = []
        for line in panel.lines[before:]:
            tag = xml.etree.ElementTree.fromstring(line)
            x, y = float(tag.get("x")), float(tag.get("y"))
            boxes.append((x, y - 11, x + 7 * len(tag.text), y + 3))
        for index, box in enumerate(boxes):
            self.assertLess(panel.outside(box), 1)
            for other in boxes[:index]:
                self.assertEqual(svg.overlap(box, other), 0)


if __name__ == "__main__":
    unittest.main()
