import unittest

from device.image.module_order import loading_order, module_name


class LoadingOrder(unittest.TestCase):
    def test_each_after_what_it_needs_and_once(self) -> None:
        needs = {"a.ko": ["b.ko", "c.ko"], "b.ko": ["d.ko"], "c.ko": ["d.ko"], "d.ko": [], "e": []}
        self.assertEqual(loading_order(needs, ["c.ko", "a.ko"]), ["d.ko", "c.ko", "b.ko", "a.ko"])

    def test_names(self) -> None:
        for path, name in (("kernel/fs/dm-mod.ko", "dm_mod"), ("x/9p.ko.xz", "9p")):
            self.assertEqual(module_name(path), name)
