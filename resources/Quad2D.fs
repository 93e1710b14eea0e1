#version 410 core

uniform sampler2D picture; // never set: texture unit 0
in vec2 coordinate;
out vec4 colour;

void main()
{
    colour = texture(picture, coordinate);
}
