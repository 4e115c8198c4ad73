"""A real browser, started once a session of tests, and what the tests do with it."""

from __future__ import annotations

import os
import tempfile
from pathlib import Path
from typing import Any, Callable, Iterator

import pytest
from line_page import PATIENCE
from selenium.common.exceptions import StaleElementReferenceException
from selenium.webdriver import Chrome, ChromeOptions, Keys
from selenium.webdriver.chrome.service import Service
from selenium.webdriver.common.action_chains import ActionChains
from selenium.webdriver.common.by import By
from selenium.webdriver.remote.webelement import WebElement
from selenium.webdriver.support.wait import WebDriverWait

SCREENS = Path(__file__).resolve().parents[2] / "build" / "screens"
# A server that is not there, and an answer that does not fit.
_MEANT = ("ERR_CONNECTION_REFUSED", "ERR_INCOMPLETE_CHUNKED_ENCODING", "status of 422")
DESKTOP, TABLET, UPRIGHT = (1280, 800), (1024, 768), (768, 1024)


class Browser:
    """What an operator sees and does."""

    def __init__(self, folder: str) -> None:
        options = ChromeOptions()
        for word in ("--headless=new", "--disable-gpu", "--disable-dev-shm-usage", "--lang=en",
                     "--no-first-run", "--disable-extensions", f"--user-data-dir={folder}",
                     "--disable-background-networking", "--force-device-scale-factor=1",
                     "--autoplay-policy=no-user-gesture-required", "--mute-audio"):
            options.add_argument(word)
        if os.geteuid() == 0:
            options.add_argument("--no-sandbox")
        options.set_capability("goog:loggingPrefs", {"browser": "ALL"})
        self.driver = Chrome(options=options, service=Service("/usr/bin/chromedriver"))
        self.driver.set_page_load_timeout(PATIENCE)
        self.size(DESKTOP)

    def fresh(self) -> None:
        """As if nobody had used it."""
        self.driver.get("about:blank")
        self.driver.execute_cdp_cmd("Network.clearBrowserCookies", {})
        self.driver.get_log("browser")
        self.size(DESKTOP)

    def forget(self) -> None:
        """Whatever pages of this server have kept in the browser."""
        self.script("localStorage.clear(); sessionStorage.clear()")

    def size(self, size: tuple[int, int]) -> None:
        """The size of the screen."""
        self.driver.execute_cdp_cmd("Emulation.setDeviceMetricsOverride", {
            "width": size[0], "height": size[1], "deviceScaleFactor": 1, "mobile": False})

    def open(self, url: str) -> None:
        """Go to a page."""
        self.driver.get(url)

    def script(self, text: str, *arguments: Any) -> Any:
        """What a script in the page gives."""
        return self.driver.execute_script(text, *arguments)

    def one(self, selector: str) -> WebElement:
        """An element."""
        return self.driver.find_element(By.CSS_SELECTOR, selector)

    def all(self, selector: str) -> list[WebElement]:
        """All elements."""
        return self.driver.find_elements(By.CSS_SELECTOR, selector)

    def text(self, selector: str) -> str:
        """What an element says, shown or not."""
        return str(self.script("return document.querySelector(arguments[0])?.textContent ?? ''",
                               selector)).strip()

    def wait(self, condition: Callable[[], Any], what: str) -> Any:
        """What the condition gives once it gives something."""
        waiting = WebDriverWait(self.driver, PATIENCE, 0.03, (StaleElementReferenceException,))
        return waiting.until(lambda _: condition(), what)

    def wait_text(self, selector: str, wanted: str) -> None:
        """Until an element says this."""
        waiting = WebDriverWait(self.driver, PATIENCE, 0.03)
        try:
            waiting.until(lambda _: wanted in self.text(selector))
        except Exception:
            raise AssertionError(f"{selector} says {self.text(selector)!r}, not {wanted!r}") \
                from None

    def wait_look(self, slot: str, look: str) -> None:
        """Until a slot's tile looks so."""
        self.wait(lambda: self.all(f'.tile[data-slot="{slot}"][data-look="{look}"]'),
                  f"slot {slot} looking {look}")

    def tile(self, slot: str, part: str = "") -> str:
        """What a slot's tile says."""
        return self.text(f'.tile[data-slot="{slot}"] {part}')

    def ready(self) -> None:
        """Until a question takes answers."""
        self.wait(lambda: self.all('#desk[data-ready="true"]'), "a question that takes answers")

    def type(self, *keys: str) -> None:
        """Type wherever the focus is, at once as a scanner does."""
        ActionChains(self.driver).send_keys(*keys).perform()

    def type_back(self) -> None:
        """To what had the focus before."""
        ActionChains(self.driver).key_down(Keys.SHIFT).send_keys(Keys.TAB).key_up(
            Keys.SHIFT).perform()

    def focused(self) -> str:
        """The id, or what it says, of the element that has the focus."""
        return str(self.script("const e = document.activeElement;"
                               "return e.id || e.getAttribute('aria-label') || e.textContent"))

    def picture(self, name: str) -> Path:
        """A picture of the screen, for people."""
        SCREENS.mkdir(parents=True, exist_ok=True)
        path = SCREENS / f"{name}.png"
        self.driver.save_screenshot(str(path))
        return path

    def complaints(self) -> list[str]:
        """What the browser has complained about, but for what the tests mean to happen."""
        return [entry["message"] for entry in self.driver.get_log("browser")
                if not any(word in entry["message"] for word in _MEANT)]


@pytest.fixture(scope="session")
def started_browser() -> Iterator[Browser]:
    """The one browser of this process."""
    with tempfile.TemporaryDirectory() as folder:
        browser = Browser(folder)
        yield browser
        browser.driver.quit()


@pytest.fixture
def browser(started_browser: Browser) -> Iterator[Browser]:
    """The browser, new to every page; it must have had nothing to complain about."""
    started_browser.fresh()
    yield started_browser
    complaints = started_browser.complaints()
    # A page that nobody looks at any more would go on drawing, for as long as other tests run.
    started_browser.open("about:blank")
    assert complaints == [], "\n".join(complaints)


__all__ = ["DESKTOP", "TABLET", "UPRIGHT", "Browser", "Keys", "browser", "started_browser"]
