"""What a request must have before anything is done for it, and what every response says."""

from __future__ import annotations

import logging
import secrets
from typing import Awaitable, Callable

from aiohttp import web

from amt_line.store import StoreProblem
from amt_line.view.web.address import Names
from amt_line.view.web.render import Renderer
from amt_line.view.web.token import is_same

COOKIE = "amt-token"
QUERY = "token"
HEADER = "X-AMT-Token"
ENTRANCE = "/token"
_YEAR = 365 * 24 * 3600
# A tablet that is not yet let in needs to look like something.
_OPEN = ("/static/",)

_HEADERS = {
    "Content-Security-Policy": (
        "default-src 'none'; script-src 'self'; style-src 'self'; img-src 'self'; "
        "connect-src 'self'; form-action 'self'; base-uri 'none'; frame-ancestors 'none'"),
    "X-Content-Type-Options": "nosniff",
    "X-Frame-Options": "DENY",
    "Referrer-Policy": "no-referrer",
    "Cross-Origin-Opener-Policy": "same-origin",
    "Cross-Origin-Resource-Policy": "same-origin",
}
Handler = Callable[[web.Request], Awaitable[web.StreamResponse]]

_LOG = logging.getLogger("amt_line")


class Guard:
    """Looks at every request."""

    def __init__(self, names: Names, access: str | None, renderer: Renderer) -> None:
        """``access`` is the token that a browser has to show; None when it needs none."""
        self._names = names
        self._access = access
        self._renderer = renderer
        # What a page of another origin cannot read, and so cannot send.
        self.token = secrets.token_urlsafe(24)

    @web.middleware
    async def middleware(self, request: web.Request, handler: Handler) -> web.StreamResponse:
        """Let the request through, or say why not."""
        if not self._names.mean_this(request.headers.get("Host", "")):
            return self._renderer.problem(request, 421)
        if not self._may_enter(request):
            if self._is_access(request.query.get(QUERY, "")):
                return self._admitted(request)
            return self._renderer.problem(request, 401)
        if request.method == "POST" and request.path != ENTRANCE and not self._own(request):
            return self._renderer.problem(request, 403)
        return await self._served(request, handler)

    async def _served(self, request: web.Request, handler: Handler) -> web.StreamResponse:
        """What the handler gives, or what went wrong with it, as a page."""
        try:
            return await handler(request)
        except web.HTTPException as error:
            # That a method is not allowed is said with those that are.
            if error.status < 400 or isinstance(error, web.HTTPMethodNotAllowed):
                raise
            return self._renderer.problem(request, error.status)
        except StoreProblem as error:
            return self._renderer.problem(request, 503, str(error))
        except ConnectionError:
            raise
        except Exception:  # pylint: disable=broad-except
            _LOG.exception("a page failed")
            return self._renderer.problem(request, 500)

    def _may_enter(self, request: web.Request) -> bool:
        if self._access is None or request.path == ENTRANCE or request.path.startswith(_OPEN):
            return True
        return is_same(request.cookies.get(COOKIE, ""), self._access)

    def _own(self, request: web.Request) -> bool:
        """Whether a page of this server sent it."""
        host = request.headers["Host"]
        return (request.headers.get("Origin", "") in (f"http://{host}", f"https://{host}")
                and is_same(request.headers.get(HEADER, ""), self.token))

    # who comes from another machine

    def add_to(self, application: web.Application) -> None:
        """Serve the entrance."""
        application.router.add_post(ENTRANCE, self._enter)

    async def _enter(self, request: web.Request) -> web.Response:
        given = (await request.post()).get("token", "")
        if isinstance(given, str) and self._is_access(given.strip().lower()):
            return self._admitted(request)
        return self._renderer.problem(request, 401)

    def _is_access(self, given: str) -> bool:
        return self._access is not None and is_same(given, self._access)

    def _admitted(self, request: web.Request) -> web.Response:
        """Let the browser in from now on.

        A page leads on, and no redirection: what another site has led here would come without the
        cookie.
        """
        response = self._renderer.page(request, "admitted.html")
        response.set_cookie(COOKIE, self._access or "", max_age=_YEAR, httponly=True,
                            samesite="Strict")
        return response


async def add_headers(_request: web.Request, response: web.StreamResponse) -> None:
    """What every response says to the browser."""
    response.headers.update(_HEADERS)
    response.headers.setdefault("Cache-Control", "no-store")
    response.headers.popall("Server", None)
