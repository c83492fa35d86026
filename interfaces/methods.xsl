<?xml version="1.0"?>
<!-- The methods of each interface as a table, for a service that looks at messages before they are unpacked. -->
<xsl:stylesheet version="1.0" xmlns:xsl="http://www.w3.org/1999/XSL/Transform">
  <xsl:output method="text"/>

  <xsl:template match="/">
    <xsl:text>// Made from the interface's XML.&#10;#pragma once&#10;&#10;</xsl:text>
    <xsl:text>#include "interfaces/Method.h"&#10;&#10;namespace interfaces {&#10;</xsl:text>
    <xsl:apply-templates select="node/interface"/>
    <xsl:text>&#10;}  // namespace interfaces&#10;</xsl:text>
  </xsl:template>

  <xsl:template match="interface">
    <xsl:variable name="name" select="substring-after(@name, 'com.zentor.rvd.')"/>
    <xsl:text>&#10;inline constexpr const char* k</xsl:text><xsl:value-of select="$name"/>
    <xsl:text> = "</xsl:text><xsl:value-of select="@name"/><xsl:text>";&#10;</xsl:text>
    <xsl:text>&#10;inline std::vector&lt;Method&gt; methodsOf</xsl:text><xsl:value-of select="$name"/>
    <xsl:text>() {&#10;  return {&#10;</xsl:text>
    <xsl:apply-templates select="method"/>
    <xsl:text>  };&#10;}&#10;</xsl:text>
  </xsl:template>

  <xsl:template match="method">
    <xsl:text>      {"</xsl:text><xsl:value-of select="@name"/><xsl:text>", "</xsl:text>
    <xsl:for-each select="arg[@direction='in']"><xsl:value-of select="@type"/></xsl:for-each>
    <xsl:text>", {</xsl:text>
    <xsl:for-each select="arg[@direction='in']">"<xsl:value-of select="@name"/>", </xsl:for-each>
    <xsl:text>}, "</xsl:text>
    <xsl:for-each select="arg[@direction='out']"><xsl:value-of select="@type"/></xsl:for-each>
    <xsl:text>", {</xsl:text>
    <xsl:for-each select="arg[@direction='out']">"<xsl:value-of select="@name"/>", </xsl:for-each>
    <xsl:text>}},&#10;</xsl:text>
  </xsl:template>
</xsl:stylesheet>
