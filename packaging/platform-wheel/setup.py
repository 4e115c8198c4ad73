"""A wheel for one platform: any Python, but only where the programs in it run."""

import os

from setuptools import Distribution, setup
from wheel.bdist_wheel import bdist_wheel


class PlatformDistribution(Distribution):  # type: ignore[misc]
    """Nothing in it is compiled by setuptools, so nothing but this says that it has programs."""

    def has_ext_modules(self) -> bool:
        """It is not the same for every system."""
        return True


class PlatformWheel(bdist_wheel):  # type: ignore[misc]
    """The programs are no extension modules: any Python may have them beside it."""

    def get_tag(self) -> tuple[str, str, str]:
        """Python, its interface, platform."""
        return "py3", "none", os.environ["PLATFORM_TAG"]


setup(cmdclass={"bdist_wheel": PlatformWheel}, distclass=PlatformDistribution)
