"""The properties document that stands beside each movie."""
import xml.etree.ElementTree as ElementTree
from pathlib import Path


def read_document(path):
    """The properties of a document, after checking the shape that every document has."""
    tree = ElementTree.fromstring(Path(path).read_bytes())
    assert tree.tag == "LumexServerAgentRecordingProperties" and not tree.attrib
    (properties,) = tree
    assert properties.tag == "RecordingProperties" and not properties.attrib
    for item in properties:
        assert item.tag == "RecordingProperty" and list(item.attrib) == ["key", "value"] and len(item) == 0
    return {item.get("key"): item.get("value") for item in properties}
