#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Opens the report of a mosaic in a headless browser and works with it.

usage: reportbrowser.py ZARN     (status 77 where there is no browser to drive)
"""

import json
import pathlib
import shutil
import subprocess
import sys
import tempfile

try:
    from osgeo import gdal
    from selenium import webdriver
    from selenium.webdriver.common.by import By
    from selenium.webdriver.common.keys import Keys
except ImportError as error:
    print(f"skipped: {error}; the group browser of tools/packages.txt names the packages")
    sys.exit(77)
if shutil.which("chromium") is None or shutil.which("chromedriver") is None:
    print("skipped: there is no chromium with its driver (see tools/packages.txt)")
    sys.exit(77)


def make_scene(file, left, gain):
    """Writes hilly land, seen from `left` on, with a border without data."""
    width, height = 180, 120
    driver = gdal.GetDriverByName("GTiff")
    scene = driver.Create(str(file), width, height, 3, gdal.GDT_Byte)
    scene.SetGeoTransform((5000 + 2 * left, 2, 0, 8000, 0, -2))
    for band in range(3):
        rows = bytearray(width * height)
        for y in range(4, height - 4):
            for x in range(5, width - 5):
                land = (x + left) * (3 + band) % 61 + y * 2 % 83 + 30
                rows[y * width + x] = round(gain * land) + 10
        raster = scene.GetRasterBand(band + 1)
        raster.WriteRaster(0, 0, width, height, bytes(rows))
        raster.SetNoDataValue(0)


def make_report(zarn, folder):
    scenes = [folder / "west.tif", folder / "<b>&east.tif"]
    make_scene(scenes[0], 0, 1)
    make_scene(scenes[1], 70, 0.7)
    subprocess.run(
        [zarn, "mosaic", "--balance", "gain-offset", "--feather", "6", "--report",
         folder / "report", *scenes, folder / "mosaic.tif"], check=True)
    return folder / "report" / "index.html"


def start_browser(script=True):
    options = webdriver.ChromeOptions()
    for switch in ("--headless=new", "--no-sandbox", "--disable-gpu", "--disable-dev-shm-usage",
                   "--window-size=1280,900", "--host-resolver-rules=MAP * ~NOTFOUND"):
        options.add_argument(switch)
    options.set_capability("goog:loggingPrefs", {"browser": "ALL", "performance": "ALL"})
    if not script:
        options.add_experimental_option(
            "prefs", {"profile.managed_default_content_settings.javascript": 2})
    service = webdriver.chrome.service.Service(shutil.which("chromedriver"))
    return webdriver.Chrome(service=service, options=options)


def requests(browser):
    """The addresses that the page asked for."""
    for entry in browser.get_log("performance"):
        message = json.loads(entry["message"])["message"]
        if message["method"] == "Network.requestWillBeSent":
            yield message["params"]["request"]["url"]


def clipping(browser):
    style = browser.find_element(By.ID, "after-picture").value_of_css_property("clip-path")
    return float(style.rsplit(" ", 1)[1].rstrip("%px)"))


def check_swipe(browser):
    slider = browser.find_element(By.ID, "split")
    assert clipping(browser) == 50, clipping(browser)
    slider.send_keys(Keys.HOME)
    assert clipping(browser) == 0, clipping(browser)
    slider.send_keys(Keys.END)
    assert clipping(browser) == 100, clipping(browser)
    stage = browser.find_element(By.ID, "swipe")
    drag = webdriver.ActionChains(browser).move_to_element(stage).click_and_hold()
    drag.move_by_offset(-stage.size["width"] // 4, 0).release().perform()
    assert abs(clipping(browser) - 25) < 1, clipping(browser)
    # What is clipped away is really the picture before: the two differ on the right.
    slider.send_keys(Keys.HOME)
    after = stage.screenshot_as_png
    slider.send_keys(Keys.END)
    assert stage.screenshot_as_png != after


def check_seams(browser):
    seams = browser.find_element(By.ID, "seams")
    assert seams.rect["height"] > 50, seams.rect
    browser.find_element(By.ID, "show-seams").send_keys(Keys.SPACE)
    assert seams.value_of_css_property("display") == "none"
    browser.find_element(By.CSS_SELECTOR, "label[for=show-seams]").click()
    assert seams.value_of_css_property("display") != "none"


def check_pictures(browser):
    # Of an image in an SVG nothing tells whether it was loaded, so it is loaded once more.
    sizes = browser.execute_async_script("""
        const done = arguments[0];
        const sources = [...document.querySelectorAll('img, image')]
            .map((picture) => picture.getAttribute('src') ?? picture.getAttribute('href'));
        Promise.all(sources.map(async (source) => {
          const picture = new Image();
          picture.src = source;
          await picture.decode();
          return [picture.naturalWidth, picture.naturalHeight];
        })).then(done, (error) => done(String(error)));""")
    assert sizes == [[250, 120]] * 3, sizes
    for picture in browser.find_elements(By.CSS_SELECTOR, ".stage > *"):
        box = picture.rect
        assert box["width"] > 200 and abs(box["width"] / box["height"] - 250 / 120) < 0.02, box


def check_phone(browser):
    browser.execute_cdp_cmd(
        "Emulation.setDeviceMetricsOverride",
        {"width": 375, "height": 700, "deviceScaleFactor": 2, "mobile": True})
    width = browser.execute_script("return document.documentElement.scrollWidth")
    assert width == 375, f"the page is {width} wide on a phone"


def main():
    with tempfile.TemporaryDirectory() as name:
        page = make_report(sys.argv[1], pathlib.Path(name)).as_uri()
        browser = start_browser()
        try:
            browser.get(page)
            check_pictures(browser)
            check_swipe(browser)
            check_seams(browser)
            check_phone(browser)
            assert "<b>&east" in browser.find_element(By.ID, "scenes").text
            asked = {url for url in requests(browser) if not url.startswith("data:")}
            assert asked == {page}, asked
            assert not browser.get_log("browser"), browser.get_log("browser")
        finally:
            browser.quit()
        browser = start_browser(script=False)
        try:
            browser.get(page)
            before = browser.find_element(By.CSS_SELECTOR, "#swipe > img").rect
            after = browser.find_element(By.ID, "after-picture").rect
            assert after["x"] >= before["x"] + before["width"] > before["x"] + 200, (before, after)
            assert not browser.find_element(By.ID, "split").is_displayed()
        finally:
            browser.quit()


main()
